#!/usr/bin/env bash
# Holds against each other the options that the programs take, the man pages and
# the bash completion, and the usage texts of zlkkiftools and kifcache: what is in one is in all.
#   options_test.sh BIN_DIR GETOPT_PRINT
set -euo pipefail
bin=$1
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/../.." && pwd)

# Letters that a tool takes and that select nothing.
declare -A reserved=([bootOption]='-u -w')

scratch=$(mktemp -d)
trap 'rm -rf "$scratch"' EXIT
cd "$scratch"
ln -s "$2" getopt_print  # LD_PRELOAD is parted by blanks and colons
echo 'host name "empty"' | "$bin/kifcache" build - empty.kif
export ZELLIBS_HOST=$scratch/empty.kif ASAN_OPTIONS=verify_asan_link_order=0
status=0

# Complains unless two lists have the same words; $1 says whose lists they are.
same() {
  diff --label "$2" --label "$4" -U 99 <(sorted "$3") <(sorted "$5") >difference && return
  echo "$1: $2 and $4 differ"
  grep '^[-+][^-+]\|^[-+]--\?[[:alpha:]]' difference
  status=1
}

sorted() { tr -s ' ' '\n' <<<"$1" | sed '/^$/d' | LC_ALL=C sort -u; }

# The words of $1 that are not among those of $2.
without() { LC_ALL=C comm -23 <(sorted "$1") <(sorted "$2"); }

# The options in a text for people, -abc as -a -b -c.
options_in_text() {
  grep -oE '(^|[][ (,])--?[[:alpha:]]+' | sed -E 's/^[^-]//; /^-[A-Z]{2}/d' |
    sed -E ':a; s/^-([[:alpha:]])([[:alpha:]]+)$/-\1\n-\2/; ta; P; D'
}

# The options that a man page lists, in the form of getopt_print.
options_in_page() {
  awk '/^\.It Fl / {
    for (i = 2; i <= NF; ++i) {
      if ($i != "Fl" || $(i + 1) == "Ns") continue
      takes = $(i + 2) == "Ar" ? ":" : $(i + 2) " " $(i + 3) == "Ns Op" ? "::" : ""
      print "-" $(i + 1) takes
    }
  }' "$1"
}

items_in_page() { sed -nE 's/^\.It Cm ([^ ]+).*/\1/p' "$1"; }

# What is offered for the last of the words.
completed() {
  COMP_WORDS=("$@") COMP_CWORD=$(($# - 1)) COMPREPLY=()
  "_$1"
  printf '%s\n' "${COMPREPLY[@]}"
}

check_tool() {
  local tool=$1 page=$top/man/zlkkiftools-$1.1 taken names
  [ -e "$page" ] || { echo "$tool: no man page"; status=1; return; }
  [ -L "$bin/$tool" ] || { echo "$tool: no link"; status=1; }
  # A tool without options does not ask for any; its output is no list of options.
  taken=$(LD_PRELOAD=$scratch/getopt_print "$bin/zlkkiftools" "$tool" x 2>/dev/null | grep '^-' || true)
  taken=$(without "$taken" "${reserved[$tool]-}")
  same "$tool" program "$taken" 'man page' "$(options_in_page "$page")"

  names=${taken//:/}
  same "$tool" program "$names" completion "$(completed zlkkiftools "$tool" x -)"
  same "$tool" 'options with arguments' "$(sed -n 's/\([^:]\):$/\1/p' <<<"$taken")" \
    completion "$(for name in $names; do
      _zlkkiftools_argument "$tool" "$name" >/dev/null && printf '%s\n' "$name"
    done)"
}

check_dispatcher() {
  local page=$top/man/zlkkiftools.1 usage=$1 tools=$2
  same zlkkiftools usage "$tools" 'man page' "$(items_in_page "$page")"
  same zlkkiftools usage "$tools $(options_in_text <<<"$usage")" \
    completion "$(completed zlkkiftools '')"
  same zlkkiftools usage "$(options_in_text <<<"$usage")" \
    'man page' "$(options_in_page "$page" | tr -d :)"
  same zlkkiftools usage "$(without "$tools" 'mdu pkill')" \
    'completion for a recorded host' "$(completed zlkkiftools -c file '')"
}

check_signals() {
  local page=$top/man/zlkkiftools-pkill.1 program
  program=$(grep -oE '\{"[A-Z0-9]+", [0-9]+\}' "$top/apps/zlkkiftools/worlds/pkill.cc" |
    sed -E 's/\{"(.*)".*/\1/')
  same pkill program "$program" 'man page' "$(sed -n 's/^\.Dv//p' "$page" | tr -d .)"
  same pkill program "$program" completion "$(completed zlkkiftools pkill - |
    sed -nE 's/^-([A-Z0-9]{2,})$/\1/p')"
}

check_kifcache() {
  local page=$top/man/kifcache.1 usage commands words completed command PATH=$bin:$PATH
  usage=$(kifcache --help)
  commands=$(sed -nE 's/^  ([a-z]+).*/\1/p' <<<"$usage")
  words="$commands $(options_in_text <<<"$usage")"
  same kifcache usage "$words" 'man page' \
    "$(items_in_page "$page") $(options_in_page "$page" | tr -d :)"
  completed=$(completed kifcache '')
  for command in $commands; do completed+=" $(completed kifcache "$command" - | tr -d =)"; done
  same kifcache usage "$words" completion "$completed"
  # What stays in a redacted recording is listed in full.
  sed -n '/^constexpr std::string_view k\(Everywhere\|BootOptions\)/,/;$/p' \
    "$top/apps/kifcache/redact_text.cc" | grep -o '"[^"]*"' | grep -o '[^" ]*' >stays
  sed -n '/^\.Sh WHAT STAYS/,/^All else/p' "$page" | tr -d '\134' | tr -s ' ,;' '\n' >listed
  ! grep -vxFf listed stays || status=1
}

# shellcheck source=/dev/null
. "$top/completions/zlkkiftools" && . "$top/completions/kifcache"

usage=$("$bin/zlkkiftools" none 2>&1 || true)
tools=$(sed -n '/^Functions:/,$s/^   \([^ ]*\)$/\1/p' <<<"$usage")
[ "$(wc -w <<<"$tools")" -eq 16 ] || { echo "zlkkiftools: not sixteen tools"; status=1; }
for tool in $tools; do check_tool "$tool"; done
check_dispatcher "$usage" "$tools"
check_signals
check_kifcache
exit "$status"
