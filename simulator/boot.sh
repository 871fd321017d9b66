# Sourced by the scripts here, with the build folder in $build and the device's root in $root: boots
# the device and shuts it down when the script ends.
# shellcheck shell=sh disable=SC2154
device=$build/simulator/corvex-device
keeper=

in_device() { "$device" exec "$root" "$@"; }

fail() {
    echo "$(basename "$0" .sh): $*" >&2
    exit 1
}

# boot [BOOT_OPTION]...
boot() {
    : >"$root.out" # what the last one said must not be taken for ours
    "$device" boot "$root" "$@" >>"$root.out" 2>"$root.err" &
    keeper=$!
    until grep -q "device ready" "$root.out"; do
        kill -0 "$keeper" 2>/dev/null || fail "the device did not start: $(cat "$root.err")"
        sleep 0.1
    done
    grep "^corvex-device" "$root.err" >&2 || true
}

shut_down() {
    [ -n "$keeper" ] || return 0
    kill "$keeper" 2>/dev/null || true
    wait "$keeper" 2>/dev/null || true
    keeper=
}
trap shut_down EXIT
trap 'exit 130' INT TERM
