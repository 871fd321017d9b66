#!/bin/sh
# run.sh BUILD_DIR: the whole way of a capture on a simulated device, shown from boot to the
# finished log directory. Ends with 0 only if everything written is found in it.
set -eu

here=$(cd "$(dirname "$0")" && pwd)
build=$(cd "${1:?usage: run.sh BUILD_DIR}" && pwd)
device=$build/simulator/corvex-device
root=$build/device
seconds=10
show="show-$$"
keeper=

in_device() { "$device" exec "$root" "$@"; }

fail() {
    echo "run: $*" >&2
    exit 1
}

shut_down() {
    [ -n "$keeper" ] || return 0
    kill "$keeper" 2>/dev/null || true
    wait "$keeper" 2>/dev/null || true
    keeper=
}
trap shut_down EXIT
trap 'exit 130' INT TERM

# The daemon listens a moment after it has started.
send() {
    echo "$1"
    for attempt in 1 2 3 4 5 6 7 8 9 10; do
        status=0
        in_device corvexctl "$1" 2>"$build/corvexctl.err" || status=$?
        [ "$status" = 3 ] || break
        [ "$attempt" = 10 ] || sleep 1
    done
    [ "$status" = 0 ] || fail "$1 ended with status $status: $(cat "$build/corvexctl.err")"
}

echo "booting the device in $root"
: >"$build/device.out" # what the last one said must not be taken for ours
"$device" boot "$root" >>"$build/device.out" 2>"$build/device.err" &
keeper=$!
until grep -q "device ready" "$build/device.out"; do
    kill -0 "$keeper" 2>/dev/null || fail "the device did not start: $(cat "$build/device.err")"
    sleep 0.1
done
grep "^corvex-device" "$build/device.err" || true

for recorder in main system radio event kernel tcpdump qsee tz bootloader pre_bootloader; do
    in_device setprop "persist.sys.$recorder" yes
done
# The kernel's records as they are, where they can be had.
in_device test -r /dev/kmsg && raw=yes || raw=no
in_device setprop persist.sys.kernel.kmsg "$raw"
send LOGBEGIN
send CPUTHERMAL
in_device bash -s "$show" "$seconds" <"$here/show/input.sh"
send STOPCPUTHERMAL
send LOGSTOP
in_device bash -s "$show" "$seconds" "$root" "$(id -u)" <"$here/show/report.sh" ||
    fail "the capture is not complete"
shut_down
