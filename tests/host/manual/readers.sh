#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Has the programs that show manual pages read ours, and complain of nothing.
# Usage: readers.sh FOLDER
set -euo pipefail
for page in serialization_host.1 editor-serialization.7; do
    complaints=$(gunzip -c "$1/$page.gz" | groff -man -Tutf8 -ww -rLL=78n 2>&1 >/dev/null)
    if [[ -n $complaints ]]; then
        printf '%s\n' "$complaints"
        exit 1
    fi
    gunzip -c "$1/$page.gz" | groff -man -Tascii -P-cbou | grep "^SEE ALSO" >/dev/null
done
