# bash -s SECONDS, in the device: rounds of all commands, sent by several clients at once while
# artefacts are made, for as long as that; then what the daemon holds against what it held before.
seconds=$1
work=/data/local/tmp/soak
roots=(/data/corvex /storage/emulated/0/corvex)
watched=(/data/{anr,coredump,misc/display,system/dropbox,tombstones,vendor/media}
    /data/media/0/Pictures/Screenshots)
patience=100    # seconds for one connection, and for the observer to follow
first_minute=65 # seconds until the boot recorders and the threads of the start have ended
most_logs=81920 # KiB: 15 MiB of the initial phase, once more in each capture of a round, with 4
most_waiting=16 # zombies after a round: what came together in the ends of one or two captures

# What a sample holds, and by how much the last may be above the first. A thread's stack has 8 MiB,
# and two copies of earlier logs at once need not have happened before the first.
names=("resident memory, KiB" "private memory, KiB" "writable memory, KiB" threads descriptors
    children zombies)
limits=(256 32 16384 0 0 0 0)

list_processes() { cat /proc/[0-9]*/stat 2>/dev/null; }
# Its readers carry its name, too, but are no children of init.
find_daemon() { list_processes | awk '$2 == "(corvexd)" && $4 == 1 {print $1}'; }
list_children() { list_processes | awk -v daemon="$daemon" '$4 == daemon {print $1, $3}'; }
count_zombies() { list_children | grep -c Z; }
count() { wc -l <"$work/$1"; }
complain() { echo "$*" >>"$work/complaints"; }

# In the order of the names.
take_sample() {
    local descriptors=("/proc/$daemon/fd/"*)
    awk '/^(VmRSS|RssAnon|VmData|Threads):/ {print $2}' "/proc/$daemon/status"
    echo "${#descriptors[@]}"
    list_children | grep -vc Z
    count_zombies
}

# send WORD...: in one connection. Only "DELETELOG" is answered.
send() {
    local answer status=0 wanted=
    [[ " $* " != *" DELETELOG "* ]] || wanted=CLEANSUCCESS
    printf '%s\n' "$@" >>"$work/sent"
    answer=$(timeout "$patience" corvexctl "$@" 2>&1) || status=$?
    [ "$status $answer" != "0 $wanted" ] || return 0
    complain "$*: status $status, answer \"$answer\""
    return 1
}

# What the next "LOGBEGIN" or "CHANGEPATH" finds, whichever client it comes from.
change_properties() {
    setprop persist.sys.corvex.path "$(shuf -n 1 -e data shared)"
    setprop persist.sys.kernel.kmsg "$(shuf -n 1 -e "${kernel_logs[@]}")"
}

send_one_by_one() {
    local word
    for word in $(shuf -e "${words[@]}"); do
        change_properties
        send "$word" || return
    done
}

send_at_once() {
    local shuffled
    mapfile -t shuffled < <(shuf -e "${words[@]}")
    send "${shuffled[@]}"
}

# The observer takes one event after another: once it tells of a file made now, it has done with all
# earlier ones. "CACHECLEAR" may clear away what it told, so it is asked again.
await_observer() {
    local name=tombstone_$RANDOM i
    for ((i = 0; i < patience; i++)); do
        : >"/data/tombstones/$name"
        sleep 1
        ! logcat -d -b main corvexd:E '*:S' | grep -q "filename is $name " || return 0
    done
    complain "the observer does not follow"
}

make_artefacts() {
    until [ -e "$work/rest" ]; do
        scenario all >/dev/null
        echo all >>"$work/artefacts"
        await_observer
    done
}

# A second "LOGBEGIN" or "CPUTHERMAL" leaves what the first has started to itself: that ends here.
# What records into the cache log directory goes on.
end_leftovers() {
    local pid state
    while read -r pid state; do
        [ "$state" = Z ] || grep -qs /cache/ "/proc/$pid/cmdline" || kill "$pid" 2>/dev/null
    done < <(list_children)
}

run_round() {
    rm -f "$work/rest"
    make_artefacts &
    (send_one_by_one & send_one_by_one & send_at_once & wait)
    : >"$work/rest"
    wait
    send STOPCPUTHERMAL LOGSTOP
    end_leftovers
    find "${watched[@]}" -type f -delete
    sleep 2
    du -sk "${roots[@]}" /cache | awk '{sum += $1} END {print sum}' >>"$work/logs"
    count_zombies >>"$work/waiting"
}

# The daemon reaps one child for each SIGCHLD, and ends that come together come as one. What is left
# then must go with later ones.
reap_rest() {
    local tries
    for ((tries = 2 * $(count_zombies); tries > 0; tries--)); do
        kill -CHLD "$daemon"
        sleep 0.1
    done
}

# On a terminal in one place, as often as it is called.
tell() {
    local sample
    mapfile -t sample < <(take_sample)
    [ ! -t 1 ] || printf '\r\e[K'
    printf '%s, round %d, %d commands, %d times all artefacts: ' \
        "$1" "$(count waiting)" "$(count sent)" "$(count artefacts)"
    printf 'RSS %d KiB, %d descriptors, %d threads, %d zombies' \
        "${sample[0]}" "${sample[4]}" "${sample[3]}" "${sample[6]}"
    [ -t 1 ] || echo
}

# run_rounds WHAT SECONDS: until then, but at least one; fails after the first with a complaint.
run_rounds() {
    local begun=$SECONDS round
    while :; do
        run_round &
        round=$!
        while [ -t 1 ] && kill -0 "$round" 2>/dev/null; do
            tell "$1 $((SECONDS - begun)) of $2 s"
            sleep 1
        done
        wait "$round"
        [ "$(find_daemon)" = "$daemon" ] || complain "the daemon is not the one it was"
        [ ! -s "$work/complaints" ] || return 1
        tell "$1 $((SECONDS - begun)) of $2 s"
        ((SECONDS - begun < $2)) || return 0
    done
}

compare() {
    local i growth
    printf '\n%-22s %8s %8s %8s %s\n' '' first last growth 'at most'
    for i in "${!names[@]}"; do
        growth=$((last[i] - first[i]))
        printf '%-22s %8d %8d %8d %7d\n' \
            "${names[i]}" "${first[i]}" "${last[i]}" "$growth" "${limits[i]}"
        [ "$growth" -le "${limits[i]}" ] || complain "${names[i]}: $growth more"
    done
    [ "${last[6]}" = 0 ] || complain "zombies that no SIGCHLD takes away: ${last[6]}"
}

soak() {
    local first last
    run_rounds "warming up" "$first_minute" || return
    reap_rest
    mapfile -t first < <(take_sample)
    run_rounds soaking "$seconds" || return
    reap_rest
    mapfile -t last < <(take_sample)
    compare
}

# tell_rounds FILE WHAT MOST
tell_rounds() {
    local largest
    largest=$(sort -n "$work/$1" | tail -n 1)
    echo "$2 after each round, at most $3: $(paste -sd ' ' "$work/$1")"
    [ "$largest" -le "$3" ] || complain "$2: $largest"
}

rm -rf "$work"
mkdir -p "$work" "${roots[@]}"
touch "$work"/{sent,complaints,artefacts,waiting,logs}
mapfile -t words < <(corvexctl --list | awk '{print $1}')
kernel_logs=(no)
[ ! -r /dev/kmsg ] || kernel_logs+=(yes)

until corvexctl CHANGEPATH 2>/dev/null; do sleep 1; done
daemon=$(find_daemon)
soak
echo
tell_rounds waiting "zombies until the next SIGCHLD" "$most_waiting"
tell_rounds logs "KiB of logs" "$most_logs"
echo "sent: $(sort "$work/sent" | uniq -c | awk '{printf "%s%s %d", sep, $2, $1; sep = ", "}')"
[ -s "$work/complaints" ] || exit 0
cat "$work/complaints"
exit 1
