#!/bin/sh
# shell.sh BUILD_DIR: a shell in the device that runs, or in one that runs as long as the shell.
set -eu

build=$(cd "${1:?usage: shell.sh BUILD_DIR}" && pwd)
device=$build/simulator/corvex-device
root=$build/device

if "$device" exec "$root" true 2>/dev/null; then
    exec "$device" exec "$root" /bin/sh -i
fi
: >"$build/device.out" # what the last one said must not be taken for ours
"$device" boot "$root" --quiet >>"$build/device.out" &
keeper=$!
trap 'kill "$keeper" 2>/dev/null || true; wait "$keeper" 2>/dev/null || true' EXIT
until grep -q "device ready" "$build/device.out"; do
    kill -0 "$keeper" 2>/dev/null || exit 1
    sleep 0.1
done
"$device" exec "$root" /bin/sh -i
