#!/usr/bin/env bash
# How ps costs, in ratios taken in one run (hyperfine, user plus system time, medians):
#   live, against procps on a process table with at least 2,000 threads of this script's own
#   recordings of 10,000 and 100,000 worlds, tree layout with every column
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
bin=build/release/bin
work=$(mktemp -d)
sleepers=
trap 'rm -rf "$work"; [ -z "$sleepers" ] || kill "$sleepers"' EXIT

# A host of $1 worlds: cartels of ten worlds each, the cartels a tree in which each has ten children.
host() {
  awk -v worlds="$1" 'BEGIN {
    printf "list world ="
    for (i = 1; i <= worlds; i++) printf " %d", i
    print ""
    for (i = 1; i <= worlds; i++) {
      cartel = i - (i - 1) % 10
      place = (cartel - 1) / 10
      parent = place == 0 ? 0 : int((place - 1) / 10) * 10 + 1
      printf "record world_name %d = name=\"program-%d\"\n", i, i % 97
      printf "record world_info %d = worldID=%d groupID=%d userspaceID=1 cartelID=%d parentCartelID=%d processGroupID=%d sessionID=1 worldType=%d\n", \
        i, i, cartel, cartel, i == cartel ? parent : cartel, cartel, i == cartel ? 4 : 36
      printf "record sched_Vcpus_stats_summaryStats %d = runState=1 waitState=1\n", i
      printf "record sched_Vcpus_stats_affinity %d = cpuText=\"0-%d\"\n", i, i % 8
      printf "record sched_Vcpus_stats_stateTimes %d = usedTime=%d\n", i, i * 1234
      if (i == cartel) printf "record userworld_cartel_cmdline %d = cmdline=\"/usr/bin/program-%d --number %d --and another argument\"\n", i, i % 97, i
    }
  }'
}

# The median user plus system seconds of each command of a hyperfine export.
cpu() {
  python3 - "$1" <<'PYTHON'
import json, sys
times = [r["user"] + r["system"] for r in json.load(open(sys.argv[1]))["results"]]
for t in times:
    print(f"  {t * 1000:9.2f} ms")
print(f"  ratio {times[0] / times[1]:.3f}")
PYTHON
}

python3 - <<'PYTHON' &
import threading, time
for _ in range(2000):
    threading.Thread(target=time.sleep, args=(600,), daemon=True).start()
time.sleep(600)
PYTHON
sleepers=$!
sleep 3
echo "live: ps -cgPTstvZU against procps ps -eLo ..., $(find /proc -maxdepth 3 -path '*/task/*' 2>/dev/null | wc -l) threads"
hyperfine -N -w 2 -r 15 --export-json "$work/live.json" \
  "$bin/zlkkiftools ps -cgPTstvZU" "ps -eLo pid,lwp,ppid,pgid,sid,stat,time,args" >/dev/null 2>&1
cpu "$work/live.json"
kill "$sleepers"
sleepers=

for worlds in 10000 100000; do
  host "$worlds" >"$work/host.txt"
  "$bin/kifcache" build "$work/host.txt" "$work/$worlds.kif"
  rm "$work/host.txt"
done
echo 'recordings: ps -J with every column, 100,000 worlds against 10,000'
hyperfine -N -w 1 -r 7 --export-json "$work/recorded.json" \
  "$bin/zlkkiftools -c $work/100000.kif ps -JcgPjtsTvZUnN" \
  "$bin/zlkkiftools -c $work/10000.kif ps -JcgPjtsTvZUnN" >/dev/null 2>&1
cpu "$work/recorded.json"
/usr/bin/time -f '  peak memory of 100,000 worlds: %M KiB' \
  "$bin/zlkkiftools" -c "$work/100000.kif" ps -JcgPjtsTvZUnN >/dev/null
