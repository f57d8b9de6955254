#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Makes the Debian packages of a build twice, at different times and in different folders, and compares them;
# looks at what they need and hold; and that none is made whose dependencies nobody has looked up.
# Usage: debian_packages.sh CPACK BUILD
set -euo pipefail
cpack=$1 build=$2
folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT

make_packages() {
    "$cpack" -G DEB -B "$1" --config "$build/CPackConfig.cmake" >"$1.log" 2>&1
}

fail() {
    printf '%s\n' "$*"
    exit 1
}

make_packages "$folder/one" || fail "$(cat "$folder/one.log")"
make_packages "$folder/two"
for package in libeditor-messaging0 libeditor-messaging-dev editor-serialization; do
    mv "$folder/one/${package}"_*.deb "$folder/$package"
    cmp "$folder/$package" "$folder/two/${package}"_*.deb
    dpkg-deb --field "$folder/$package" Maintainer >/dev/null
    dpkg-deb --fsys-tarfile "$folder/$package" | tar -t >"$folder/$package.files"
done

# names PACKAGE FIELD TEXT: the field of the package names that.
names() {
    local field
    field=$(dpkg-deb --field "$folder/$1" "$2")
    [[ $field == *"$3"* ]] || fail "$2 of $1 does not name $3: $field"
}
version=$(dpkg-deb --field "$folder/editor-serialization" Version)
names libeditor-messaging0 Depends libnats
names libeditor-messaging0 Depends libc6
names libeditor-messaging-dev Depends "libeditor-messaging0 (= $version)"
names editor-serialization Depends "libeditor-messaging0 (= $version)"
names editor-serialization Depends libicu
names editor-serialization Recommends nats-server
names editor-serialization Recommends ca-certificates

# holds PACKAGE PATTERN: the package has a file whose name matches.
holds() {
    grep -qE "$2" "$folder/$1.files" || fail "$1 has no $2"
}
holds libeditor-messaging0 '/libeditor_messaging\.so\.[0-9]+$'
holds libeditor-messaging-dev '/libeditor_messaging\.so$'
holds libeditor-messaging-dev '/EditorSerializationConfig\.cmake$'
holds libeditor-messaging-dev '/editor-messaging\.pc$'
holds editor-serialization '/libcom_vorplanex_serialization\.so$'
holds editor-serialization '^\./usr/bin/serialization_host$'
holds editor-serialization '/serialization-host@\.service$'
holds editor-serialization '/man1/serialization_host\.1\.gz$'
holds editor-serialization '/docs?/.*/deployment\.md$'

(export PATH=/nowhere && make_packages "$folder/three") && fail 'packages were made without dpkg-shlibdeps'
grep -q 'cannot be made without dpkg-shlibdeps' "$folder/three.log" || fail "$(cat "$folder/three.log")"
