#!/bin/sh
# Compares the cartel tools with the tools of this machine that do the same, live:
#   bench/cartels.sh [folder of the built programs]
# What counts is the CPU time (User plus System). Tools that are not installed are left out.
set -eu
bin=$(cd "${1:-$(dirname "$0")/../build/release/bin}" && pwd)
unset ZELLIBS_HOST ZELLIBS_TRACE || true

# A name and a pattern that every process is compared with and few or none match.
name=no-such-program
pattern='no such( program| thing)$'

installed() { command -v "$1" >/dev/null 2>&1; }
in_busybox() { installed busybox && busybox --list | grep -qx "$1"; }

# Runs its arguments, each a command line, against each other. A search that finds nothing fails,
# which is no fault here.
compare() { hyperfine --shell=none --ignore-failure --warmup 5 --min-runs 50 "$@"; }

set -- "$bin/zlkkiftools pgrep -f '$pattern'"
if installed pgrep; then set -- "$@" "$(command -v pgrep) -f '$pattern'"; fi
if in_busybox pgrep; then set -- "$@" "busybox pgrep -f '$pattern'"; fi
compare "$@"

set -- "$bin/zlkkiftools pidof $name"
if installed pidof; then set -- "$@" "$(command -v pidof) $name"; fi
if in_busybox pidof; then set -- "$@" "busybox pidof $name"; fi
compare "$@"

# -n and -P: neither side looks names up.
set -- "$bin/zlkkiftools lsof"
if installed lsof; then set -- "$@" "$(command -v lsof) -n -P"; fi
compare "$@"
