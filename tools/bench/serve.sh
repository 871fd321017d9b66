#!/usr/bin/env bash
# One run of a job that serves until it is told to end. COMMAND says "ready" first.
#   serve.sh watch STAGED DIR CURRENT COMMAND...   until what was STAGED and moved into DIR is CURRENT
#   serve.sh client CLIENT PATH COUNT COMMAND...   until COUNT connections to PATH have been served
set -euo pipefail

watch() {
  local staged=$1 directory=$2 current=$3 files
  files=("$staged"/*)
  mv "${files[@]}" "$directory"
  until [[ -s $current/${files[-1]##*/} ]]; do sleep 0.01; done
}

client() { "$1" client "$2" "$3"; }

job=$1
arguments=("${@:2:3}")
shift 4
coproc server { exec setsid "$@"; }
pid=$! # the shell forgets it when the server ends
read -r -u "${server[0]}"
"$job" "${arguments[@]}"
kill -- "-$pid"
wait "$pid" || true
