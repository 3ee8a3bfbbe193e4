#!/usr/bin/env bash
# Builds the package twice, the second time from a copy of the sources in another directory, without
# their history, with another umask, time zone and language, and compares the bytes.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../.."

copy=$(mktemp -d)/a-longer-name-than-before
trap 'rm -rf "${copy%/*}"' EXIT
mkdir "$copy"
tar -c --exclude=./build --exclude=./.git . | tar -xC "$copy"
package=$(scripts/package)
again=$(umask 077 && TZ=Asia/Kathmandu LC_ALL=C.UTF-8 "$copy/scripts/package")
cmp "$package" "$again" && exit
diff <(dpkg-deb -c "$package") <(dpkg-deb -c "$again") || true
diff <(dpkg-deb -I "$package" md5sums) <(dpkg-deb -I "$again" md5sums) || true
exit 1
