# Completion of corvexctl's command words and options, for bash.
# shellcheck shell=bash

# The words come from the program itself. It takes them in any letter case, so any may be typed.
_corvexctl() {
    local current=$2 previous=$3
    if [[ $previous = --socket ]]; then
        mapfile -t COMPREPLY < <(compgen -f -- "$current")
    elif [[ $current = -* ]]; then
        mapfile -t COMPREPLY < <(compgen -W "--socket --list --help" -- "$current")
    else
        mapfile -t COMPREPLY < <(compgen -W "$("$1" --list 2>/dev/null | cut -d ' ' -f 1)" -- "${current^^}")
    fi
}
complete -F _corvexctl corvexctl
