# bash -s NAME SECONDS, in the device: real input for every recorder, a batch each second.
name=$1
seconds=$2
lines=0

packets() {
    for _ in 1 2 3 4 5; do
        echo "$name" 2>/dev/null >/dev/udp/127.0.0.1/9
    done
}

for ((second = 1; second <= seconds; second++)); do
    for _ in 1 2 3 4 5; do
        lines=$((lines + 1))
        for buffer in main system radio events crash; do
            log -t show -b "$buffer" "$name $buffer line $lines"
        done
    done
    packets
    # Without the machine's leave to write there it is not in the device, or refuses.
    [ ! -w /dev/kmsg ] || echo "<6>$name kernel line $second" 2>/dev/null >/dev/kmsg
    text="recording: $second of $seconds s, $lines lines to each of five buffers, packets on loopback"
    if [ -t 1 ]; then printf '\r%s' "$text"; else echo "$text"; fi
    sleep 1
done
[ ! -t 1 ] || echo
