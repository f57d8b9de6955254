#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Has a shell complete command lines by the file that is for it. Ends with 77 where the shell is not installed.
# Usage: completes.sh SHELL FILE
set -euo pipefail
shell=$1 file=$2
here=$(cd "$(dirname "$0")" && pwd)
command -v "$shell" >/dev/null || exit 77
folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT
mkdir "$folder/a folder"
touch "$folder/a file"
cd "$folder"

# completions_in_bash WORD...: what the last of the words, which may be empty, can become, a line each.
completions_in_bash() {
    # shellcheck disable=SC2016 # The shell that is tried expands it.
    bash -c 'source "$1"; shift
        compopt() { :; }   # It works only where a line is being edited.
        COMP_WORDS=("$@") COMP_CWORD=$(($# - 1))
        "_$1"
        printf "%s\n" "${COMPREPLY[@]}"' bash "$file" serialization_host "$@"
}

completions_in_fish() {
    local line
    line="serialization_host$(printf ' %s' "$@")"
    # shellcheck disable=SC2016
    fish --no-config -c 'source $argv[1]; complete -C $argv[2]' "$file" "$line" |
        sed 's/\t.*//; s/\\//g; s/\/$//'
}

# zsh completes only where a line is being edited, so it edits one in a terminal of its own.
completions_in_zsh() {
    local line
    line="serialization_host$(printf ' %s' "$@")"
    zsh -f "$here/complete.zsh" "$file" "$line" | sed 's/\\//g; s/\/$//'
}

# expect WORD... to COMPLETION...: the last of the words can become each of the completions.
expect() {
    local -a words=()
    while [[ $1 != to ]]; do
        words+=("$1")
        shift
    done
    shift
    local found completion
    found=$("completions_in_$shell" "${words[@]}")
    for completion in "$@"; do
        if ! grep -qxF -e "$completion" <<<"$found"; then
            printf '"%s" is not completed to "%s" but to:\n%s\n' "${words[*]}" "$completion" "$found"
            exit 1
        fi
    done
}

# expect_not WORD... to COMPLETION: the last of the words cannot become that.
expect_not() {
    if (expect "$@") >/dev/null; then
        printf 'must not be completed so: %s\n' "$*"
        exit 1
    fi
}

expect '' to read write history serve stdio
expect 'hi' to history
expect read '--' to --content-type --utf8 --text --timeout
expect_not read '--' to --root
expect serve '--' to --root --nats --nats-password-file --tls-ca --no-web --metrics --no-safe-saves
expect --log-level debug serve '--ro' to --root
expect serve --root '' to 'a folder'
expect_not serve --root '' to 'a file'
expect serve --creds '' to 'a folder' 'a file'
expect read '' to 'a file'
expect read 'a' to 'a file'
