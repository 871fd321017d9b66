# bash -s NAME SECONDS ROOT USER MADE, in the device: shows the newest log directory and checks that
# all input is in it. ROOT is where the device's root lies on the machine, USER who runs the device,
# MADE what `scenario all` said.
name=$1
seconds=$2
root=$3
user=$4
made=$5
logs=/data/corvex
missing=0

complain() {
    echo "missing: $*"
    missing=1
}

# check FILE PATTERN LINES: the lines that match it are numbered, at their ends, from 1 to LINES:
# they stand in the file once each and in order.
check() {
    local found
    found=$(awk -v pattern="$2" '$0 ~ pattern && $NF == n + 1 {n++} END {print n + 0}' "$1")
    [ "$found" = "$3" ] || complain "$1 holds $found of $3 lines with \"$2\""
}

# check_firmware NAME: everything in its log is in unbroken order, and there is at least a line for
# each second.
check_firmware() {
    local lines
    lines=$(wc -l <"$1.log")
    check "$1.log" "^\\[ *[0-9.]+\\] $1: .*, event " "$lines"
    [ "$lines" -ge "$seconds" ] || complain "$1.log has only $lines lines"
}

# The bootloader's partition held the text of seven starts, as much of it as fits 20 KiB, and what
# has been read from there is erased.
check_bootloader() {
    local partition=/dev/block/platform/soc/624000.ufshc/by-name/reserve1
    cmp bootloader.log /dev/nodes/proc/bootloader_log || complain "bootloader.log differs"
    for _ in 1 2 3 4 5 6 7; do cat bootloader.log; done | head -c 20K | cmp - pre_bootloader.log ||
        complain "pre_bootloader.log differs"
    cmp -n 32K "$partition" /dev/zero || complain "$partition is not erased"
}

# At least a sample every four seconds, each with all frequencies and most zones; they change.
check_thermal() {
    awk -F ', ' -v samples=$((seconds / 4 + 1)) '
        { values = 0; for (i = 2; i <= NF; i++) if ($i ~ /^[a-z_0-9]+=-?[0-9]+$/) values++ }
        NF == 22 && /cpu0_freq=[0-9]+, .*, cpu3_freq=[0-9]+, / && values > 12 { good++ }
        { sub(/[^,]*/, ""); if (!seen[$0]++) different++ }
        END { exit !(NR >= samples && good == NR && different > 1) }' kv_tsen_data/* ||
        complain "the thermal record is not as it should be"
}

# check_artefact SCENARIO FOLDER: what the scenario made was collected under FOLDER, a pattern.
check_artefact() {
    local sources source
    sources=$(sed -n "s/^$1: //p" <<<"$made")
    [ "$sources" ] || complain "an artefact of the scenario $1"
    for source in $sources; do
        # shellcheck disable=SC2086 # a pattern
        cmp "$source" $2/"${source##*/}" || complain "$source, collected whole in $2/"
    done
}

# A dump is collected anew with each change that is seen of it, one copy behind the other: the last
# is whole. And the display has been told to end its dumping.
check_dump() {
    local dump name
    dump=$(sed -n 's/^display: //p' <<<"$made")
    if [ -z "$dump" ]; then
        complain "an artefact of the scenario display"
        return
    fi
    name=${dump##*/}
    tail -c "$(stat -c %s "$dump")" "rawdata/$name/$name" | cmp - "$dump" ||
        complain "$dump, collected whole in rawdata/$name/"
    [ "$(getprop debug.sf.dump)" = 0 ] || complain "the end of the dumping of the display"
}

# What goes with a trace: the state of the binder calls and of the input devices at that moment.
check_trace() {
    local file
    for file in transactions transaction_log state; do
        cmp "/dev/nodes/proc/proc_$file" anr/*/"$file" || complain "anr/*/$file, as it was at the trace"
    done
    grep -q "INPUT MANAGER" anr/*/dumpsys_input || complain "anr/*/dumpsys_input"
}

check_artefacts() {
    check_artefact tombstone 'tombstones/*'
    check_artefact anr 'anr/*'
    check_artefact dropbox dropbox
    check_artefact screenshot Screenshots
    check_artefact coredump coredump
    check_artefact media 'media/*'
    check_dump
    check_trace
    [ -e "$logs/.nomedia" ] || complain "$logs/.nomedia, for the screenshot's sake"
}

check_bugreport() {
    [ "$(sed -n '1p;$p' ./*-BUGREPORT.log | grep -c "^== bugreport[: ]")" = 2 ] ||
        complain "a whole bug report"
}

list() {
    find "$1" -mindepth 1 -type d -printf '%10y  %P/\n' -o -printf '%10s  %P\n' | LC_ALL=C sort -k 2
}

# show_area DIRECTORY FILE...: the files must be in it.
show_area() {
    local area=$1 file
    shift
    echo
    echo "$area:"
    list "$area"
    for file in "$@"; do [ -e "$area/$file" ] || complain "$area/$file"; done
}

# What a boot log held at the last show must have been set aside at this boot's start.
show_boot_log() {
    local area=/cache/boot_log shown=/cache/.boot_log_shown
    local files=(android_boot.log event_boot.log kernel_boot.log radio_boot.log)
    [ ! -e "$shown" ] || files+=("${files[@]/%/.pre}")
    show_area "$area" "${files[@]}"
    grep -q "corvexd main start" "$area/android_boot.log" ||
        complain "$area/android_boot.log does not hold the daemon's first line"
    touch "$shown"
}

show_initial_logs() {
    local marker=/cache/fileAfter911
    if [ -e "$marker" ]; then
        echo "no initial phase is recorded: there is $marker"
    else
        show_area /cache/log_before_initial android_initial.log event_initial.log kernel_initial.log
        echo "recorded at every boot until there is $marker: create it to end the initial phase"
    fi
}

# show_tail FILE [WIDTH]
show_tail() {
    echo
    echo "== $1"
    # A fixed-size record ends in zero bytes, which no terminal wants.
    tail -n 3 "$1" | tr -d '\0' | cut -c "1-${2:-160}"
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
list .

for file in *; do
    case $file in
    tcpdump*) ;;
    *) [ ! -f "$file" ] || [ ! -s "$file" ] || show_tail "$file" ;;
    esac
done
show_tail kv_tsen_data/* 1000
show_packets
show_boot_log
show_initial_logs

echo
for buffer in main system crash; do
    check android.log "$name $buffer line" $((seconds * 5))
done
check radio.log "$name radio line" $((seconds * 5))
check event.log "$name events line" $((seconds * 5))
# The kernel's own records have numbers before their text.
[ ! -w /dev/kmsg ] || check kernel.log "^[0-9]+,[0-9]+,[0-9]+,.*;$name kernel line" "$seconds"
check_firmware qsee
check_firmware tz
check_bootloader
check_thermal
check_bugreport
check_artefacts
[ "$missing" = 0 ] || exit 1
echo "every line written was recorded, every artefact collected; the capture lies in"
echo "$root$PWD"
[ "$user" = 0 ] || echo "(its files belong to users of the device: ./dev shell reads them)"
