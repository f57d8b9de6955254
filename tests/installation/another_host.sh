#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Runs the example of a host that embeds the bundle, and looks at its answers and at the file it wrote.
# Usage: another_host.sh PROGRAM
set -euo pipefail
folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT
cd "$folder"

answers=$("$1")
diff <(printf '%s\n' true '{"data":"Grüße aus dem Editor","status":true}') <(printf '%s\n' "$answers")
diff <(printf 'Grüße aus dem Editor') embedding.txt
