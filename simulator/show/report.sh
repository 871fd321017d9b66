# bash -s NAME SECONDS ROOT USER, in the device: shows the newest log directory and checks that all
# input is in it. ROOT is where the device's root lies on the machine, USER who runs the device.
name=$1
seconds=$2
root=$3
user=$4
logs=/data/corvex
missing=0

complain() {
    echo "missing: $*"
    missing=1
}

# check FILE BUFFER LINES: all lines from 1 to LINES stand in the file, once each and in order.
check() {
    local found
    found=$(awk -v text="$name $2 line " 'index($0, text) && $NF == n + 1 {n++} END {print n + 0}' "$1")
    [ "$found" = "$3" ] || complain "$1 holds $found of $3 lines written to $2"
}

show_tail() {
    echo
    echo "== $1"
    # A fixed-size record ends in zero bytes, which no terminal wants.
    tail -n 3 "$1" | tr -d '\0' | cut -c 1-160
}

show_packets() {
    local file count=0
    for file in tcpdump*; do
        [ -s "$file" ] || continue
        count=$((count + $(tcpdump -Z root -n -r "$file" 2>/dev/null | wc -l)))
        echo
        echo "== $file"
        tcpdump -Z root -n -r "$file" 2>/dev/null | tail -n 3 | cut -c 1-160
    done
    echo "$count packets"
    [ "$count" -gt 0 ] || [ "$user" != 0 ] || complain "no packet was recorded"
}

directories=("$logs"/KVBR_*_current)
cd "${directories[0]}" 2>/dev/null || {
    complain "no log directory in $logs"
    exit 1
}
echo
echo "log directories:"
(cd "$logs" && ls -d KVBR_*)
echo
echo "$(basename "$PWD"):"
find . -mindepth 1 -type d -printf '%10y  %P/\n' -o -printf '%10s  %P\n' | LC_ALL=C sort -k 2

for file in *; do
    case $file in
    tcpdump*) ;;
    *) [ ! -f "$file" ] || [ ! -s "$file" ] || show_tail "$file" ;;
    esac
done
show_packets

echo
for buffer in main system crash; do check android.log "$buffer" $((seconds * 5)); done
check radio.log radio $((seconds * 5))
check event.log events $((seconds * 5))
[ ! -w /dev/kmsg ] || check kernel.log kernel "$seconds"
[ "$missing" = 0 ] || exit 1
echo "every line written was recorded; the capture lies in"
echo "$root$PWD"
[ "$user" = 0 ] || echo "(its files belong to users of the device: ./dev shell reads them)"
