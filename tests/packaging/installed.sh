#!/bin/bash
# SPDX-License-Identifier: Apache-2.0
# Installs, uses and purges the packages of /tmp, in a Debian that is thrown away afterwards.
set -euxo pipefail
export DEBIAN_FRONTEND=noninteractive LC_ALL=C.UTF-8
cd /tmp

# What the packages' own files are among; what others install with them stays.
files() {
    find / -xdev \( -path /proc -o -path /sys -o -path /dev -o -path /tmp \) -prune -o -print | grep -iE 'editor|serialization' | sort
}

apt-get update
files >before
apt-get install -y --no-install-recommends systemd-standalone-sysusers
apt-get install -y --no-install-recommends ./libeditor-messaging0_*.deb ./editor-serialization_*.deb nats-server
getent passwd editor

printf 'P\xe2t\xe9 en cro\xfbte\n' >menu.txt
diff <(serialization_host read --utf8 menu.txt) - <<'END'
{"data":"Pâté en croûte\n","encoding":"windows-1252","filePath":"menu.txt","status":true}
END
diff <(printf 'Suppe\n' | serialization_host write --text soup.txt) <(echo true)
diff <(cat soup.txt) <(echo Suppe)

timeout --preserve-status --signal=TERM 2 serialization_host serve --root /tmp --listen 127.0.0.1:0 >addresses
grep '^page: http://' addresses
grep '^nats: nats://' addresses

apt-get purge -y editor-serialization libeditor-messaging0 nats-server
rm -rf /root/.local
diff before <(files)
