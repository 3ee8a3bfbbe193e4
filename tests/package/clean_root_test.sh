#!/usr/bin/env bash
# Installs a package into a clean root directory, runs every tool there, removes the package, and
# looks for what it left behind.
#   clean_root_test.sh PACKAGE
# The root directory is made by debootstrap from this machine's mirror, once, and kept in build/.
set -euo pipefail
package=$(realpath "$1")
cd "$(dirname "${BASH_SOURCE[0]}")/../.."
here=tests/package

as_root=()
[ "$(id -u)" -eq 0 ] || as_root=(sudo)

# shellcheck source=/dev/null
codename=$(. /etc/os-release && echo "$VERSION_CODENAME")
mirror=$(apt-get indextargets --format "\$(RELEASE) \$(SITE)" 'Created-By: Packages' |
  awk -v release="$codename" '$1 == release { print $2; exit }')
base=$PWD/build/clean-root-$codename.tar
root=$(mktemp -d)
trap '"${as_root[@]}" rm -rf --one-file-system "$root"' EXIT

if [ ! -e "$base" ]; then
  "${as_root[@]}" debootstrap --variant=minbase "$codename" "$root" "$mirror" >build/debootstrap.log
  "${as_root[@]}" tar -C "$root" --numeric-owner -cf "$base.new" .
  "${as_root[@]}" mv "$base.new" "$base"
else
  "${as_root[@]}" tar -C "$root" --numeric-owner -xf "$base"
fi

# Runs a command in the root directory, with processes and mounts of its own.
inside() {
  # shellcheck disable=SC2016  # the inner shell expands
  "${as_root[@]}" unshare --mount --pid --fork --kill-child sh -c \
    'mount --bind "$0" "$0" && mount -t proc proc "$0/proc" && mount -t sysfs -o ro sysfs "$0/sys" &&
     exec chroot "$0" env -i PATH=/usr/sbin:/usr/bin LC_ALL=C.UTF-8 TZ=UTC \
       DEBIAN_FRONTEND=noninteractive "$@"' "$root" "$@"
}

# All that is there, but for what the package manager writes down about every run.
contents() {
  "${as_root[@]}" find "$root" -xdev \( -path "$root/var/log" -o -path "$root/var/cache" \
    -o -path "$root/var/lib/apt" -o -path "$root/tmp" \) -prune -o -printf '/%P %y %m %u %l\n' |
    LC_ALL=C sort
}

"${as_root[@]}" chmod 755 "$root"
"${as_root[@]}" cp "$package" tests/hosts/arm64.txt "$here/in_clean_root.sh" "$root/"
# The mirror is asked once more for the package's dependencies.
inside apt-get update -qq
contents >build/clean-root.before
inside apt-get install -y -qq --no-install-recommends "/${package##*/}" >build/clean-root.log 2>&1 ||
  { cat build/clean-root.log; exit 1; }
inside bash /in_clean_root.sh
inside apt-get purge -y -qq --autoremove zlkkiftools >>build/clean-root.log 2>&1 ||
  { cat build/clean-root.log; exit 1; }
contents >build/clean-root.after
diff build/clean-root.before build/clean-root.after || { echo 'the package left traces'; exit 1; }
! inside grep -rl zlkkiftools /etc /var/lib/dpkg || { echo 'the package is still known'; exit 1; }
