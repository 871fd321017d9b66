# bash -s, in the device: what the log tells from the daemon's start to the first command that it
# takes, as it comes. What has been told before is only counted.
declare -A told
repeated=0
while read -r _ time line; do
    if [ "${told[$line]:-}" ]; then
        repeated=$((repeated + 1))
        continue
    fi
    told[$line]=yes
    [ "$repeated" = 0 ] || echo "    (lines repeated meanwhile: $repeated)"
    repeated=0
    echo "    $time $line"
    [[ $line != *"print buf--"* ]] || break
done < <(exec logcat -b main -v time corvexd:V installd:V vold:V '*:S')
kill "$!"
[[ $line = *"print buf--"* ]]
