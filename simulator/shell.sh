#!/bin/sh
# shell.sh BUILD_DIR: a shell in the device that runs, or in one that runs as long as the shell.
set -eu

here=$(cd "$(dirname "$0")" && pwd)
build=$(cd "${1:?usage: shell.sh BUILD_DIR}" && pwd)
root=$build/device
# shellcheck source=simulator/boot.sh
. "$here/boot.sh"

in_device true 2>/dev/null || boot --quiet
in_device /bin/sh -i
