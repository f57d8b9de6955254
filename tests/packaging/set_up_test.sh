#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Checks what people are told while ./start and ./test build: that a build waits for another one, and
# how far it is.
set -euo pipefail
# shellcheck source=../../packaging/set_up.sh
source "$(dirname -- "${BASH_SOURCE[0]}")/../../packaging/set_up.sh"
root=$(mktemp -d)
trap 'rm -rf -- "$root"' EXIT

# A project of 19 steps, each of which makes a file.
cat >"$root/CMakeLists.txt" <<'END'
cmake_minimum_required(VERSION 3.25)
project(sample LANGUAGES NONE)
foreach(step RANGE 1 19)
  add_custom_command(OUTPUT ${step} COMMAND ${CMAKE_COMMAND} -E touch ${step})
  list(APPEND steps ${step})
endforeach()
add_custom_target(sample ALL DEPENDS ${steps})
END

# expect TEXT: fails unless the last build has said so.
expect() {
    if ! grep -qxF -- "$1" "$root/said"; then
        printf 'not said: %s\n' "$1"
        cat "$root/said"
        exit 1
    fi
}

build_sample() {
    (build sample -D SAMPLE=1) 2>"$root/said"
}

build_sample
expect '== configuring sample'
expect '== building sample'
expect '== 50 % are built'
expect '== 100 % are built'

# Holds the lock as another build does, until the next one has said that it waits.
exec 8>"$root/build/sample.lock"
flock 8
build_sample 8>&- &
waiting=$!
for ((tries = 0; tries < 600; ++tries)); do
    ! grep -q waiting "$root/said" || break
    sleep 0.1
done
expect '== waiting for another build of sample to end'
exec 8>&-
wait "$waiting"

# Where there is nothing to do, nothing is said.
build_sample
[[ ! -s $root/said ]] || { cat "$root/said"; exit 1; }
