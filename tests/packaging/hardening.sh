#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Checks that programs and shared libraries have the protections that they are to be shipped with.
# Usage: hardening.sh FILE...
set -u
failures=0

# has FILE WHAT PATTERN COMMAND...: the output of COMMAND, which is about FILE, holds PATTERN.
has() {
    local file=$1 what=$2 pattern=$3
    shift 3
    if ! "$@" "$file" | grep -Eq "$pattern"; then
        printf '%s has no %s\n' "$file" "$what"
        failures=$((failures + 1))
    fi
}

for file in "$@"; do
    has "$file" "addresses that differ from run to run" 'Type: +DYN' readelf -hW
    has "$file" "stack that is data only" 'GNU_STACK .* RW ' readelf -lW
    has "$file" "tables that are read-only once it runs" 'GNU_RELRO' readelf -lW
    has "$file" "functions bound at its start" 'BIND_NOW|Flags:.*NOW' readelf -dW
    has "$file" "stack protector" ' UND __stack_chk_fail' readelf -W --dyn-syms
    has "$file" "checked functions of the C library" ' UND __[a-z]+_chk' readelf -W --dyn-syms
    if [[ $(uname -m) == x86_64 ]]; then
        # A few come from the compiler's own start-up code.
        if (($(objdump -d --no-show-raw-insn "$file" | grep -c endbr64) < 50)); then
            printf '%s has no marks where calls may go\n' "$file"
            failures=$((failures + 1))
        fi
    fi
done
exit $((failures > 0))
