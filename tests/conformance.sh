#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Checks that docs/conformance.md names tests, and only tests that exist.
set -euo pipefail
root=$(dirname -- "$(dirname -- "$(readlink -f -- "${BASH_SOURCE[0]}")")")

existing=$(grep -rhoE '^TEST(_F|_P)?\([A-Za-z0-9]+, *[A-Za-z0-9]+' --include='*.cpp' "$root/tests" |
    sed -E 's/^TEST(_F|_P)?\(//; s/, */./' | sort -u)
named=$(grep -oE '`[A-Za-z0-9]+\.[A-Z][A-Za-z0-9]+`' "$root/docs/conformance.md" | tr -d '\140' | sort -u)

missing=$(comm -13 <(printf '%s\n' "$existing") <(printf '%s\n' "$named"))
if [[ -n $missing ]]; then
    printf 'docs/conformance.md names tests that do not exist:\n%s\n' "$missing"
    exit 1
fi
if grep -nE '^\| [^|]+ \| *\|$' "$root/docs/conformance.md"; then
    printf 'docs/conformance.md has behaviours without a test\n'
    exit 1
fi
printf '%s tests named, all of them exist\n' "$(wc -l <<<"$named")"
