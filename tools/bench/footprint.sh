#!/usr/bin/env bash
# footprint.sh BUILD_DIR [SECONDS]: the daemon's memory, its size, and what wakes it while nothing
# happens, watched for two minutes or that long; beside those of loggers that one knows.
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
build=$(cd "${1:?usage: footprint.sh BUILD_DIR [SECONDS]}" && pwd)
seconds=${2:-120}
starts=20
root=$build/bench-device
# shellcheck source=simulator/boot.sh
. "$here/../../simulator/boot.sh"

work=$(mktemp -d)
peers=(svlogd s6-log rsyslogd)
declare -A pid=()
finish() {
  [[ ${#pid[@]} -eq 0 ]] || kill "${pid[@]}" 2>/dev/null || true
  shut_down
  rm -rf "$work"
}
trap finish EXIT

# start_peer NAME: with the script's descriptor 9 to read from. It is ready when there is something
# in $work/NAME/current: the first line, or, for the one that makes a socket, that.
start_peer() {
  local folder=$work/$1
  mkdir -p "$folder"
  case $1 in
    svlogd) svlogd "$folder" <&9 2>/dev/null & ;;
    s6-log) s6-log n10 "$folder" <&9 & ;;
    rsyslogd)
      echo "module(load=\"imuxsock\" SysSock.Name=\"$folder/current\")
*.* $folder/log" >"$folder/configuration"
      rsyslogd -n -f "$folder/configuration" -i "$folder/pid" 2>/dev/null &
      ;;
  esac
  pid[$1]=$!
}

# Prints the median of the times, in milliseconds, that a peer takes from its start until it is ready.
starting_time() {
  local name=$1 file=$work/$1/current begin
  for ((i = 0; i < starts; i++)); do
    rm -rf "${work:?}/$name"
    echo "a line" >&9
    begin=${EPOCHREALTIME/./}
    start_peer "$name"
    until [[ -s $file || -S $file ]]; do :; done
    echo $((${EPOCHREALTIME/./} - begin))
    kill "${pid[$name]}"
    wait "${pid[$name]}" || true
  done >"$work/times"
  sort -n "$work/times" | awk 'NR == '$((starts / 2 + 1))' { printf "%.1f", $1 / 1000 }'
}

stripped_size() {
  strip -o "$work/stripped" "$1"
  echo $(($(stat -c %s "$work/stripped") / 1024))
}

# Of all threads together.
wake_ups() { awk '/^voluntary_ctxt_switches/ { n += $2 } END { print n }' "/proc/$1"/task/*/status; }

# Prints a row for each NAME=PID=REST, after watching all of them at once.
watch() {
  local row before=()
  for row in "$@"; do before+=("$(wake_ups "$(cut -d = -f 2 <<<"$row")")"); done
  sleep "$seconds"
  for row in "$@"; do
    IFS='=' read -r name id rest <<<"$row"
    awk -v name="$name" -v wake_ups=$((($(wake_ups "$id") - before[0]) * 3600 / seconds)) \
      -v rest="$rest" '
      /^Rss/ { resident = $2 } /^Private/ { private += $2 }
      END { printf "  %-20s %8d %8d %9d %s\n", name, private, resident, wake_ups, rest }
    ' "/proc/$id/smaps_rollup"
    before=("${before[@]:1}")
  done
}

rm -rf "$root"
boot --quiet
mkfifo "$work/input"
exec 9<>"$work/input"
declare -A facts
for name in "${peers[@]}"; do
  facts[$name]=$(printf '%8d %8s' "$(stripped_size "$(command -v "$name")")" "$(starting_time "$name")")
done
rows=()
for name in "${peers[@]}"; do
  start_peer "$name"
  rows+=("$name=${pid[$name]}=${facts[$name]}")
done
sleep 70 # the daemon's start has its own threads, which have ended by then
daemon=$(pgrep -x corvexd -P "$(pgrep -P "$keeper" | paste -s -d ,)")
size=$(stripped_size "$build/corvexd")
printf '  %-20s %8s %8s %9s %8s %8s\n' \
  "for $seconds s" private resident wake-ups stripped ready idle KiB KiB "an hour" KiB "after ms"
watch "corvexd=$daemon=$(printf '%8d' "$size")" "${rows[@]}"
in_device corvexctl LOGBEGIN
watch "corvexd, capturing=$daemon="
