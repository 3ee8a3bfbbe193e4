#!/bin/sh
# CPU time of lspci on this machine against pciutils' lspci with the same names, and the most memory
# it holds.
#   bench/pci_lspci.sh BIN_DIRECTORY
set -eu

ours=${1:?usage: $0 BIN_DIRECTORY}/lspci
results=$(mktemp)
trap 'rm -f "$results"' EXIT

hyperfine -N --warmup 20 --runs 300 --export-json "$results" "$ours" /usr/bin/lspci >&2
kib=$(/usr/bin/time -f %M "$ours" 2>&1 >/dev/null | tail -n 1)
jq -r --arg kib "$kib" '
  [.results[] | (.user + .system) * 1000] as [$ours, $theirs] |
  "lspci: \($ours * 100 | round / 100) ms CPU, pciutils \($theirs * 100 | round / 100) ms, ratio " +
  "\($ours / $theirs * 100 | round / 100) (at most 0.5); peak \($kib) KiB (at most 16384)"' \
  "$results"
