#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Builds the example of a host that embeds the bundle by what pkg-config says, and runs it.
# Usage: pkg_config.sh LIBRARY-FOLDER SOURCE COMPILER [FLAG...]
set -euo pipefail
libraries=$1 source=$2
shift 2
folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT
export PKG_CONFIG_PATH="$libraries/pkgconfig"

# shellcheck disable=SC2046 # one word for each flag
"$@" -std=c++20 -DBUNDLE="\"$(pkg-config --variable=bundle editor-messaging)\"" -o "$folder/embedding" "$source" \
    $(pkg-config --cflags --libs editor-messaging)
LD_LIBRARY_PATH="$libraries" "$(dirname "$0")/another_host.sh" "$folder/embedding"
