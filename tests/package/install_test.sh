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
