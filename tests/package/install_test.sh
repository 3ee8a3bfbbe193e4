#!/usr/bin/env bash
# Installs a build into a directory that no loader searches, and runs what is there: the programs
# find their library beside them, by whatever name they are called.
#   install_test.sh BUILD_DIR
set -euo pipefail
prefix=$(mktemp -d)
trap 'rm -rf "$prefix"' EXIT
cmake --install "$1" --prefix "$prefix" >/dev/null

fail() { echo "$*" >&2; exit 1; }

unset LD_LIBRARY_PATH
for program in "$prefix"/bin/kifcache "$prefix"/lib/zlkkiftools/bin/*; do
  library=$(LD_TRACE_LOADED_OBJECTS=1 "$program" | awk '/libzellibs/ { print $3 }')
  [ "$(realpath "$library")" = "$prefix/lib/libzellibs.so" ] || fail "$program uses $library"
done
"$prefix/bin/kifcache" --version >/dev/null
"$prefix/lib/zlkkiftools/bin/uptime" | grep -q 'load average' || fail 'uptime does not run'

# What others build on: the face in C, the records in C++.
export PKG_CONFIG_LIBDIR=$prefix/share/pkgconfig
read -ra flags <<<"$(pkg-config --define-prefix --cflags --libs zellibs)"
echo 'int main(void) { return HostType_OSIsZLK(); }' >"$prefix/user.c"
gcc -std=c99 -Wall -Wextra -Werror -include zellibs.h "$prefix/user.c" "${flags[@]}" -o "$prefix/user"
ASAN_OPTIONS=verify_asan_link_order=0 LD_LIBRARY_PATH=$prefix/lib "$prefix/user" || fail 'a program in C finds another host'
for records in "$prefix"/include/zellibs/records/*.h; do
  g++ -std=c++20 -Werror -fsyntax-only -x c++ -include "$records" "${flags[@]}" /dev/null
done
