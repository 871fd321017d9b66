#!/usr/bin/env bash
# soak.sh BUILD_DIR [SECONDS]: all that the daemon can do, again and again, on a device of its own.
# Ends with 0 only if the daemon lives through it, leaks nothing, answers as it should, and logs no
# line that soak/known_lines does not know.
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd)
build=$(cd "${1:?usage: soak.sh BUILD_DIR [SECONDS]}" && pwd)
seconds=${2:-300}
root=$build/soak-device
# shellcheck source=simulator/boot.sh
. "$here/boot.sh"

# Everything is on, and so small that each series rotates.
properties=(
    persist.sys.{main,system,radio,event,kernel,tcpdump,qsee,tz,bootloader,pre_bootloader}"=yes"
    "persist.sys.qxdm=yes"
    "persist.sys.assert.panic=true"
    persist.oem.{bt,gps,nfc,wifi}.debug"=1"
    persist.sys.{android,radio,event,kernel}.logsize"=16"
    persist.sys.{android,radio,event,kernel}.lognum"=3"
    "persist.sys.tcpdump.logsize=1"
)

# An ordinary user's device has files of further users, on whose behalf a user namespace can act.
remove_root() {
    rm -rf "$root" 2>/dev/null || unshare --map-root-user --map-auto rm -rf "$root"
}

# Counts the daemon's lines that match no pattern, until the log ends.
watch_log() {
    in_device logcat -b main -v tag corvexd:V '*:S' | awk -v table="$here/soak/known_lines" '
        BEGIN {
            while ((getline line <table) > 0) if (line ~ /^[A-Z] /) known[++count] = "^" line "$"
        }
        /^---------/ { next }
        {
            sub(/\/corvexd *: /, " ")
            sub(/ *$/, "")
            for (i = 1; i <= count; i++) if ($0 ~ known[i]) next
            unknown[$0]++
        }
        END { for (line in unknown) printf "%7d  %s\n", unknown[line], line }'
}

if in_device true 2>/dev/null; then fail "a device runs on $root already"; fi
remove_root
# Once for the properties: the second start finds them as a phone's would.
boot --quiet
for property in "${properties[@]}"; do in_device setprop "${property%=*}" "${property#*=}"; done
shut_down
boot --quiet
watch_log >"$build/soak.unknown" &
watcher=$!
in_device bash -s soak 1000000 <"$here/show/input.sh" >/dev/null &

status=0
in_device bash -s "$seconds" <"$here/soak/rounds.sh" || status=1
shut_down
wait "$watcher" || true
if [ -s "$build/soak.unknown" ]; then
    echo "lines that are not in $here/soak/known_lines:"
    sort -rn "$build/soak.unknown"
    status=1
fi
if [ "$status" = 0 ]; then
    echo "nothing leaked, nothing unexpected"
else
    echo "what the device's programs said besides: $root.err"
fi
exit "$status"
