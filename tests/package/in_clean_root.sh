#!/bin/bash
# Runs every tool as somebody would who has just installed the package; clean_root_test.sh starts it
# in a root directory and a PID namespace of its own.
set -euo pipefail
cd "$(mktemp -d)"
fail() { echo "in the clean root: $*" >&2; exit 1; }

[ "$(dpkg -L zlkkiftools | grep -c '^/usr/bin/')" -eq 2 ] || fail 'it replaces programs'
# shellcheck disable=SC2016  # dpkg-query expands it
version=$(dpkg-query -W -f '${Version}' zlkkiftools)
[ "$(kifcache --version)" = "kifcache ${version%-*}" ] || fail 'kifcache has another version'
kifcache build /arm64.txt host.kif
kifcache check host.kif >/dev/null

# expect WORDS COMMAND... : the command succeeds and prints the words.
expect() {
  local words=$1 printed
  shift
  printed=$("$@") || fail "$* ended with $?"
  [[ $printed == *"$words"* ]] || fail "$* printed: $printed"
}
recorded() { expect "$1" zlkkiftools -c host.kif "${@:2}"; }
recorded 'Mass storage controller: Red Hat, Inc. Virtio block device [vda]' lspci
recorded 'load average: ' uptime
ZELLIBS_HOST=$PWD/host.kif expect '/mnt/ram/gone:            5' zlkkiftools mdu -u

# Live, by the tools' own names.
PATH=/usr/lib/zlkkiftools/bin:$PATH
[ "$(type -p ps)" = /usr/lib/zlkkiftools/bin/ps ] || fail 'the tools have no names of their own'
sleep 1000 &
sleeper=$!
expect "$sleeper " pidof sleep
expect "  $sleeper  sleep" ps -J
pkill -PIPE 'sleep$'  # the shell says nothing about this signal
ended=0
wait "$sleeper" || ended=$?
[ "$ended" -eq 141 ] || fail "pkill -PIPE ended it with $ended"
for tool in /usr/lib/zlkkiftools/bin/*; do
  "$tool" --version >/dev/null 2>&1 </dev/null || [ $? -lt 126 ] || fail "$tool does not start"
done

for page in zlkkiftools kifcache $(printf 'zlkkiftools-%s ' /usr/lib/zlkkiftools/bin/* |
  sed 's,/[^ ]*/,,g'); do
  gzip -t "/usr/share/man/man1/$page.1.gz" || fail "no page for $page"
done
# shellcheck source=/dev/null
. /usr/share/bash-completion/completions/zlkkiftools
complete -p zlkkiftools >/dev/null || fail 'no completion'
