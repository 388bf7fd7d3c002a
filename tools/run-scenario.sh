#!/usr/bin/env bash
# Plays the example scripts against a service of their own and checks what arrived.
# usage: tools/run-scenario.sh [BUILD_DIR]
# The service gets private directories, which go at the end; exit status 0 only when everything arrived and the service
# ended cleanly.
set -euo pipefail

root=$(cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.." && pwd -P)
build=${1:-$root/build}
[[ $build == /* ]] || build=$PWD/$build
daemon=$build/bin/tarnreportingd
scenario=$build/bin/tarnreportingscenario
ctl=$build/bin/tarnreportingctl
for program in "$daemon" "$scenario" "$ctl"; do
  [[ -x $program ]] || { printf 'run-scenario: %s is not built\n' "$program" >&2; exit 64; }
done

# Played at once, each by a process of its own; then, alone, what only makes sense when nothing else runs.
together=(music_player call haptics_engine alarm system_sounds api_usage dictation game_audio)
afterwards=(one_shots)

private=$(mktemp -d "${TMPDIR:-/tmp}/tarnscenario.XXXXXX")
service=
# shellcheck disable=SC2317  # called by the trap
cleanup() {
  if [[ -n $service ]]; then
    kill -KILL "$service" 2>/dev/null || true
    wait "$service" 2>/dev/null || true
  fi
  rm -rf -- "$private"
}
trap cleanup EXIT
trap 'exit 130' INT
trap 'exit 143' TERM

show_log() {
  printf 'run-scenario: the service logged:\n' >&2
  tail -n 40 -- "$private/log" >&2 || true
}

socket=$private/socket
state=$private/state
"$daemon" --socket "$socket" --state-dir "$state" --log-target stderr 2>"$private/log" &
service=$!

scripts=()
for name in "${together[@]}"; do scripts+=("$root/examples/$name.jsonl"); done
then=()
for name in "${afterwards[@]}"; do then+=(--then "$root/examples/$name.jsonl"); done

status=0
"$scenario" --ctl "$ctl" --socket "$socket" --state-dir "$state" "${then[@]}" "${scripts[@]}" || status=1

kill -TERM "$service"
ended=0
wait "$service" || ended=$?
service=
if ((ended != 0)); then
  printf 'run-scenario: the service ended with status %d, expected 0\n' "$ended" >&2
  status=1
fi
((status == 0)) || show_log
exit "$status"
