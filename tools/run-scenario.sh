#!/usr/bin/env bash
# Plays the example scripts against services of their own and checks what arrived.
# usage: tools/run-scenario.sh [BUILD_DIR]
# Two passes: an ordinary device, then an internal build. Each service gets private directories, which go at the end;
# exit status 0 only when everything arrived and both services ended cleanly.
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
together=(music_player call group_session haptics_engine alarm system_sounds api_usage dictation game_audio test_tones)
afterwards=(one_shots)
# The same on the internal build.
together_internal=(voice_memo)

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

# pass NAME PROPERTIES SCENARIO_ARGUMENT...: one service and what is played to it. Prints the end of its log when
# something went wrong.
pass() {
  local directory=$private/$1 properties=$2 status=0 ended=0
  shift 2
  mkdir -- "$directory"
  printf '%s\n' "$properties" >"$directory/device.json"
  "$daemon" --socket "$directory/socket" --state-dir "$directory/state" --device-properties "$directory/device.json" \
    --log-target stderr 2>"$directory/log" &
  service=$!
  "$scenario" --ctl "$ctl" --socket "$directory/socket" --state-dir "$directory/state" "$@" || status=1
  kill -TERM "$service"
  wait "$service" || ended=$?
  service=
  if ((ended != 0)); then
    printf 'run-scenario: the service ended with status %d, expected 0\n' "$ended" >&2
    status=1
  fi
  if ((status != 0)); then
    printf 'run-scenario: the service logged:\n' >&2
    tail -n 40 -- "$directory/log" >&2 || true
  fi
  return "$status"
}

scripts=()
for name in "${together[@]}"; do scripts+=("$root/examples/$name.jsonl"); done
then=()
for name in "${afterwards[@]}"; do then+=(--then "$root/examples/$name.jsonl"); done
internal=()
for name in "${together_internal[@]}"; do internal+=("$root/examples/internal/$name.jsonl"); done

status=0
pass ordinary '{"InternalBuild": false, "haptics": false}' "${then[@]}" "${scripts[@]}" || status=1
pass internal '{"InternalBuild": true, "haptics": true}' --internal-build "${internal[@]}" || status=1
exit "$status"
