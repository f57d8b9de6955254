#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Checks that no program or shared library below the folders looks for libraries where somebody else may
# have put one: an empty or relative entry of a run path means the folder that the program is started in.
# Usage: run_paths.sh FOLDER...
set -euo pipefail
with_run_path=0
failures=0

# run_paths_of FILE: its run paths, each followed by a colon and on a line of its own.
run_paths_of() {
    readelf -dW "$1" | sed -nE 's/.*\((RPATH|RUNPATH)\).*\[(.*)\]$/\2:/p'
}

# check FILE: complains of each entry that is neither absolute nor begins at the file's own folder.
check() {
    local file=$1 path entry
    while read -r path; do
        with_run_path=$((with_run_path + 1))
        while IFS= read -r -d : entry; do
            if [[ $entry != /* && $entry != "\$ORIGIN" && $entry != "\$ORIGIN/"* ]]; then
                printf '%s looks for libraries in "%s"\n' "$file" "$entry"
                failures=$((failures + 1))
            fi
        done <<<"$path"
    done < <(run_paths_of "$file")
}

while IFS= read -r -d '' file; do
    # Programs and shared libraries begin with this mark.
    if [[ $(head -c 4 "$file" | tr -d '\0') == $'\x7fELF' ]]; then
        check "$file"
    fi
done < <(find "$@" -type f -print0)

if ((with_run_path == 0)); then
    printf 'no run path was found: %s\n' "$*"
    exit 1
fi
exit $((failures > 0))
