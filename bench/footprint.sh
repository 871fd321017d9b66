#!/usr/bin/env bash
# footprint.sh BUILD_DIR [SECONDS]: the daemon's memory, and what wakes it while nothing happens,
# watched for two minutes or that long; beside those of loggers that one knows.
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
build=$(cd "${1:?usage: footprint.sh BUILD_DIR [SECONDS]}" && pwd)
seconds=${2:-120}
root=$build/bench-device
# shellcheck source=simulator/boot.sh
. "$here/../simulator/boot.sh"

work=$(mktemp -d)
peers=()
finish() {
  [[ ${#peers[@]} -eq 0 ]] || kill "${peers[@]}" 2>/dev/null || true
  shut_down
  rm -rf "$work"
}
trap finish EXIT

# Of all threads together.
wake_ups() { awk '/^voluntary_ctxt_switches/ { n += $2 } END { print n }' "/proc/$1"/task/*/status; }

# Prints "NAME private resident wake-ups" of each NAME=PID, after watching all of them at once.
watch() {
  local pair pid before=()
  for pair in "$@"; do before+=("$(wake_ups "${pair#*=}")"); done
  sleep "$seconds"
  for pair in "$@"; do
    pid=${pair#*=}
    awk -v name="${pair%=*}" -v wake_ups=$((($(wake_ups "$pid") - before[0]) * 3600 / seconds)) '
      /^Rss/ { resident = $2 } /^Private/ { private += $2 }
      END { printf "  %-28s %8d %8d %12d\n", name, private, resident, wake_ups }
    ' "/proc/$pid/smaps_rollup"
    before=("${before[@]:1}")
  done
}

rm -rf "$root"
boot --quiet
sleep 70 # the start's own threads have ended by then
daemon=$(pgrep -x corvexd -P "$(pgrep -P "$keeper" | paste -s -d ,)")
mkfifo "$work/input"
exec 9<>"$work/input"
mkdir "$work/svlogd"
svlogd "$work/svlogd" <&9 2>/dev/null &
peers+=($!)
s6-log n10 "$work/s6-log" <&9 &
peers+=($!)
echo 'module(load="imuxsock" SysSock.Name="'"$work"'/socket")
*.* '"$work"'/rsyslog' >"$work/rsyslog.conf"
rsyslogd -n -f "$work/rsyslog.conf" -i "$work/rsyslog.pid" 2>/dev/null &
peers+=($!)
sleep 1
printf '  %-28s %8s %8s %12s\n' idle "private" "resident" "wake-ups"
printf '  %-28s %8s %8s %12s\n' "" KiB KiB "an hour"
watch "corvexd=$daemon" "svlogd=${peers[0]}" "s6-log=${peers[1]}" "rsyslogd=${peers[2]}"
in_device corvexctl LOGBEGIN
watch "corvexd, capturing=$daemon"
strip -o "$work/stripped" "$build/corvexd"
printf '  stripped size: %d KiB\n' $(($(stat -c %s "$work/stripped") / 1024))
