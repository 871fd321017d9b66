#!/usr/bin/env bash
# run.sh BUILD_DIR: what the daemon's jobs cost, on this machine and now. Prints the median of five
# runs of each.
set -euo pipefail
build=${1:?usage: run.sh BUILD_DIR}
driver=$build/bench/bench_driver
mebibytes=256
runs=5

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# Prints "user system" seconds of one run.
reader_times() {
  rm -f "$work"/copy*
  local TIMEFORMAT='%U %S'
  { time "$driver" reader "$work/source" "$work/copy" $((20 << 20)) 2>/dev/null; } 2>&1
}

head -c "${mebibytes}M" /dev/urandom >"$work/source"
for ((run = 0; run < runs; run++)); do reader_times; done | sort -n -k 2 |
  awk -v middle=$(((runs + 1) / 2)) -v mebibytes="$mebibytes" 'NR == middle {
    printf "reader, %d MiB in chunks of 1 KiB: user %.2f s, system %.2f s, user/system %.2f\n",
      mebibytes, $1, $2, $1 / $2 }'

"$build/bench/boot_time"
