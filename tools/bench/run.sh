#!/usr/bin/env bash
# run.sh BUILD_DIR: what each of the daemon's jobs costs on this machine and now, beside what a user
# would run instead and beside the floor: the system calls alone that the job cannot do without.
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
programs=$(cd "${1:?usage: run.sh BUILD_DIR}/tools/bench" && pwd)
driver=$programs/bench_driver
floor=$programs/bench_floor
runs=7

work=$(mktemp -d -p /dev/shm corvex-bench-XXXXXX)
trap 'rm -rf "$work"' EXIT
cd "$work"

# compare TITLE PREPARATION NAME COMMAND [NAME COMMAND]...: one table; ours comes first, then the
# floor. Each run of each starts after the preparation.
compare() {
  local title=$1 preparation=$2 arguments=()
  shift 2
  while [[ $# -gt 0 ]]; do
    arguments+=(--command-name "$1" "$2")
    shift 2
  done
  echo "$title"
  hyperfine --shell=none --warmup 1 --runs "$runs" --style none --export-json result.json \
    --prepare "sh -c '$preparation'" "${arguments[@]}" >hyperfine.log 2>&1 ||
    { cat hyperfine.log && return 1; }
  jq -r '.results | .[1] as $floor | .[] | [.command, .median, .user, .system,
    .median / $floor.median, (.user + .system) / ($floor.user + $floor.system)] | @tsv' result.json |
    awk -F '\t' 'BEGIN { printf "  %-22s %9s %9s %9s %9s %9s\n",
        "", "wall s", "user s", "system s", "wall", "cpu" }
      { printf "  %-22s %9.4f %9.4f %9.4f %9.2f %9.2f\n", $1, $2, $3, $4, $5, $6 }'
}

fresh='rm -rf out && mkdir -p out && printf "s16777215\nn0\n" >out/config'

lines() { awk -v count="$1" 'BEGIN { for (i = 1; i <= count; i++) printf "%01023d\n", i }' >source; }

reader() { # TITLE, what comes before a reader and what it reads
  local title=$1 before=$2 source=$3
  compare "$title" "$fresh" \
    ours "sh -c '$before exec $driver reader $source out/log 16777215'" \
    floor "sh -c '$before exec $floor reader $source out/log 16777215'" \
    svlogd "sh -c '$before exec svlogd out <$source'" \
    multilog "sh -c '$before exec multilog s16777215 n1000 ./out <$source'" \
    s6-log "sh -c '$before exec s6-log n1000 s16777215 ./out <$source'" \
    rotatelogs "sh -c '$before exec rotatelogs out/log 16M <$source'"
}

tree() { # DIRECTORIES of so many FILES of 4 KiB
  rm -rf tree
  for ((i = 0; i < $1; i++)); do
    mkdir -p "tree/$i"
    head -c $(($2 * 4096)) /dev/zero | split -a 4 -b 4096 - "tree/$i/file_"
  done
}

lines 131072
reader "reader: a file of 128 MiB in lines of 1 KiB" "" source
mkfifo node
reader "reader: a node of 200,000 records, one a read" "$floor records node 200000 &" node

compare "copy_file: 128 MiB" "rm -f copy" \
  ours "$driver copy_file source copy" floor "$floor copy_file source copy" \
  "cp" "cp source copy"
rm -f source copy

tree 1 5000
compare "copy_folder: 5,000 files of 4 KiB" "rm -rf log && mkdir -p log/copy" \
  ours "$driver copy_folder tree/0 log/copy" floor "$floor copy_folder tree/0 log/copy" \
  "cp -r" "cp -r tree/0 log/copy"

tree 20 1000
compare "dirsize: 20,000 files" true \
  ours "$driver dirsize tree" floor "$floor dirsize tree" "du -sb" "du -sb tree"
compare "delete: 20,000 files" "rm -rf gone && cp -r tree gone" \
  ours "$driver delete gone" floor "$floor delete gone" "rm -rf" "rm -rf gone"

awk 'BEGIN { for (i = 0; i < 30; i++)
  printf "/dev/block/by-name/p%d /mnt/p%d ext4 ro,noatime,barrier=1 wait,check,formattable\n", i, i
}' >fstab
compare "fstab: 30 lines, 5,000 times" true \
  ours "$driver fstab fstab 5000" "reading alone" "$floor fstab fstab 5000" \
  libmount "$programs/libmount_fstab fstab 5000"

tree 1 5000
watch="$here/serve.sh watch staged watched $work/root/1_current"
compare "watch: 5,000 artefacts of 4 KiB" \
  "rm -rf staged watched root && cp -r tree/0 staged && mkdir -p watched root/1_current" \
  ours "$watch $driver watch watched $work/root" floor "$watch $floor watch watched $work/root" \
  "inotifywait and cp" "$watch $here/inotify_copy.sh watched $work/root/1_current"

client="$here/serve.sh client $floor $work/socket 20000"
compare "socket: 20,000 connections of ten commands" "rm -f socket" \
  ours "$client $driver socket $work/socket" floor "$client $floor socket $work/socket"

"$programs/scale" 2>/dev/null
"$programs/boot_time"
"$here/footprint.sh" "$programs/.."
