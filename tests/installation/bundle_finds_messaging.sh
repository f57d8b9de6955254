#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Checks that the loader finds the messaging library for the bundle where hosts put it: beside the bundle and
# two folders up.
# Usage: bundle_finds_messaging.sh BUNDLE LIBRARY-FOLDER
set -euo pipefail
folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT
mkdir -p "$folder/plugins/editorservices/serialization"
bundle="$folder/plugins/editorservices/serialization/${1##*/}"
cp "$1" "$bundle"

# finds_it_in PLACE LIBRARY-FOLDER: with the library in PLACE and nowhere else, it is that one.
finds_it_in() {
    cp -P "$2"/libeditor_messaging.so.* "$1"
    ldd "$bundle" | grep -E "^\s*libeditor_messaging\.so\.[0-9.]+ => $folder/" || {
        printf 'not found in %s:\n' "$1"
        ldd "$bundle"
        exit 1
    }
    rm "$1"/libeditor_messaging.so.*
}

finds_it_in "$folder/plugins" "$2"
finds_it_in "${bundle%/*}" "$2"
if ldd "$bundle" | grep -q 'libeditor_messaging.* => /'; then
    printf 'it is found where it is not, so this test tests nothing:\n'
    ldd "$bundle"
    exit 1
fi
