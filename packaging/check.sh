#!/usr/bin/env bash
# check.sh PACKAGES_DIR: tries out the Debian packages in it, unpacked where no build and no source is:
# what is in them, what they need, the completion in real shells, a capture on a device and a page of it.
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd)
packages=$(cd "${1:?usage: check.sh PACKAGES_DIR}" && pwd)
tree=$(mktemp -d)
chmod 755 "$tree"
build=$tree/usr/libexec/corvex # as the scripts of the simulator know it
root=$tree/phone
# shellcheck source=simulator/boot.sh
. "$here/../simulator/boot.sh"
device=$tree/usr/bin/corvex-device
# An ordinary user's device has files of further users, on whose behalf a user namespace can act.
remove_tree() { rm -rf "$tree" 2>/dev/null || unshare --map-root-user --map-auto rm -rf "$tree"; }
trap 'shut_down; remove_tree' EXIT

# check WHAT EXPECTED FOUND
check() { [ "$2" = "$3" ] || fail "$1: expected \"$2\", found \"$3\""; }

unpack() {
    local package file
    for package in client simulator; do
        dpkg-deb -x "$packages"/corvex-"$package"_*.deb "$tree"
    done
    check "files outside /usr" "" "$(find "$tree" -mindepth 1 -maxdepth 1 ! -name usr)"
    for file in bin/corvexctl bin/corvex-device \
        share/man/man{1/corvexctl.1,1/corvex-device.1,1/corvex-report.1,8/corvexd.8}.gz; do
        [ -e "$tree/usr/$file" ] || fail "no /usr/$file"
    done
    gzip -t "$tree"/usr/share/man/*/*
}

# The programs link to what is in Debian's packages, and the packages say so.
check_needs() {
    local needs package
    needs=$(dpkg-deb -f "$packages"/corvex-simulator_*.deb Depends)
    for package in android-libbase android-libcutils android-liblog libc6 tcpdump; do
        [[ ", $needs" = *", $package"* ]] || fail "the simulator does not depend on $package: $needs"
    done
    lintian --allow-root --fail-on error,warning "$packages"/*.deb
}

# The daemon serves only when the storage has come up.
capture() {
    local lines _
    boot --quiet
    in_device setprop persist.sys.main yes
    for _ in {1..60}; do
        in_device corvexctl LOGBEGIN 2>/dev/null && break
        sleep 0.5
    done
    in_device log -t check "a line of $$"
    sleep 1
    in_device corvexctl LOGSTOP || fail "LOGSTOP ended with status $?"
    lines=$(in_device sh -c "grep -c 'check *: a line of $$' /data/corvex/KVBR_1--*/android.log") || true
    check "the line that was logged, in android.log" 1 "$lines"
}

report() {
    local capture=("$root"/data/corvex/KVBR_1--*)
    "$tree/usr/bin/corvex-report" "${capture[0]}" -o "$tree/page.html" >/dev/null
    grep -q "${capture[0]##*/}" "$tree/page.html" || fail "corvex-report made a page of something else"
}

unpack
check_needs
PATH=$tree/usr/bin:$PATH "$here/check_completion.py" "$tree/usr/share"
capture
report
echo "packages: complete, and a device with them captures"
