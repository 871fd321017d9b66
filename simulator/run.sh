#!/bin/sh
# run.sh BUILD_DIR [BOOT_OPTION]...: the whole way of a capture on a simulated device, shown from
# boot to the finished log directory. Ends with 0 only if everything written is found in it.
set -eu

here=$(cd "$(dirname "$0")" && pwd)
build=$(cd "${1:?usage: run.sh BUILD_DIR [BOOT_OPTION]...}" && pwd)
shift
root=$build/device
seconds=10
patience=30 # seconds; the storage takes less than five to come up
show="show-$$"
# shellcheck source=simulator/boot.sh
. "$here/boot.sh"

send() {
    echo "$1"
    in_device corvexctl "$1" || fail "$1 ended with status $?"
}

# The daemon serves only when the storage has come up. Nothing is said here: the log tells of it.
begin_capture() {
    for _ in $(seq $((patience * 2))); do
        status=0
        in_device corvexctl LOGBEGIN 2>"$build/corvexctl.err" || status=$?
        [ "$status" = 3 ] || break
        sleep 0.5
    done
    [ "$status" != 3 ] || fail "the daemon does not serve, after $patience seconds of waiting"
    [ "$status" = 0 ] || fail "LOGBEGIN ended with status $status: $(cat "$build/corvexctl.err")"
}

# Switches the collecting of artefacts. A daemon that finds it on as it starts begins a capture of its
# own, which would take the first of the firmware's lines.
collect() { in_device setprop persist.sys.assert.panic "$1"; }

echo "booting the device in $root"
boot "$@"
echo "the daemon's start, as the log tells of it (E stands before many routine lines; it waits for the"
echo "storage to come up):"
in_device timeout $((patience * 2)) bash -s <"$here/show/start.sh" &
teller=$!

collect false # somebody may have left it on; the daemon looks seconds from now, behind the storage
for recorder in main system radio event kernel tcpdump qsee tz bootloader pre_bootloader; do
    in_device setprop "persist.sys.$recorder" yes
done
# The kernel's records as they are, where they can be had.
in_device test -r /dev/kmsg && raw=yes || raw=no
in_device setprop persist.sys.kernel.kmsg "$raw"
begin_capture
wait "$teller" || fail "the log does not tell of the daemon's first command"
send CPUTHERMAL
collect true
made=$(in_device scenario all) || fail "the device cannot make its artefacts"
echo "$made"
in_device bash -s "$show" "$seconds" <"$here/show/input.sh"
send STOPCPUTHERMAL
send BUGREPORT
send LOGSTOP
collect false
in_device bash -s "$show" "$seconds" "$root" "$(id -u)" "$made" <"$here/show/report.sh" ||
    fail "the capture is not complete"
shut_down
