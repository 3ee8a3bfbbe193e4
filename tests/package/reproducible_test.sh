#!/usr/bin/env bash
# Builds the package twice, the second time from a copy of the sources in another directory, with
# another umask, time zone and language, and compares the bytes.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../.."

copy=$(mktemp -d)/a-longer-name-than-before
trap 'rm -rf "${copy%/*}"' EXIT
mkdir "$copy"
git ls-files -z --cached --others --exclude-standard | tar -c --null --ignore-failed-read -T - |
  tar -xC "$copy"
SOURCE_DATE_EPOCH=${SOURCE_DATE_EPOCH:-$(git log -1 --format=%ct)}
export SOURCE_DATE_EPOCH
package=$(scripts/package)
again=$(umask 077 && TZ=Asia/Kathmandu LC_ALL=C.UTF-8 "$copy/scripts/package")
cmp "$package" "$again" && exit
diff <(dpkg-deb -c "$package") <(dpkg-deb -c "$again") || true
diff <(dpkg-deb -I "$package" md5sums) <(dpkg-deb -I "$again" md5sums) || true
exit 1
