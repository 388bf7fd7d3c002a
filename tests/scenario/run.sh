#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Plays the example scripts against services of their own and compares what arrived with examples/*.expected.jsonl.
# usage: tests/scenario/run.sh [--update] [BUILD_DIR]
# Three passes: an ordinary device, one with a driver that counts, then an internal build. Each service gets private
# directories, which go at the end. What is worth a look afterwards is kept in BUILD_DIR/scenario.
# Exit status 0 only when everything arrived, in order, and nothing else, and all services ended cleanly.
# --update: writes what arrived to examples/*.expected.jsonl instead and shows the difference, to be reviewed.
set -euo pipefail

update=()
if [[ ${1:-} == --update ]]; then
  update=(--update)
  shift
fi

root=$(cd -- "$(dirname -- "${BASH_SOURCE[0]}")/../.." && pwd -P)
build=${1:-$root/build}
[[ $build == /* ]] || build=$PWD/$build
daemon=$build/bin/tarnreportingd
scenario=$build/bin/tarnreportingscenario
ctl=$build/bin/tarnreportingctl
for program in "$daemon" "$scenario" "$ctl"; do
  [[ -x $program ]] || { printf 'run: %s is not built\n' "$program" >&2; exit 64; }
done
kept=$build/scenario

# Played at once, each by a process of its own; then, alone, what only makes sense when nothing else runs.
together=(music_player call group_session haptics_engine alarm system_sounds api_usage dictation game_audio test_tones)
afterwards=(one_shots)
# Alone on a device with a driver that counts.
drivers=(rumble)
# At once on the internal build.
together_internal=(voice_memo haptics_leak stuck_sound quiet_alarm faulty_call traced_tones)

private=$(mktemp -d "${TMPDIR:-/tmp}/tarnscenario.XXXXXX")
details=$private/details.txt
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

# What the internal pass needs before its service starts: the defaults that switch diagnostics on and the probes of the
# traced session.
prepare_internal() {
  local directory=$1 suite=sys.oxbow.tarnkit.tarnreporting
  "$ctl" --state-dir "$directory/state" defaults write "$suite" ParleyInvalidXyBackOffSeconds 3600
  "$ctl" --state-dir "$directory/state" defaults write "$suite" enable_gyre true
  "$ctl" --state-dir "$directory/state" defaults write "$suite" wait_time 1000
  cat >"$directory/probes.plist" <<'PLIST'
<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0"><array>
<dict><key>name</key><string>everything</string><key>signpost</key><string>*</string></dict>
</array></plist>
PLIST
}

# write_channels DIRECTORY ENGINE_ON BUCKET_HITS TRANSITIONS RESIDENCY DUTY_CYCLE: what the driver has counted, replaced
# whole.
write_channels() {
  mkdir -p -- "$1/state/flume"
  printf '{"driver": "OxbowFoo<0x12>", "group": "Haptics", "subgroup": "Stats", "channels": [
    {"name": "Engine On", "format": "simple", "unit": "times", "value": %s},
    {"name": "Latency", "format": "histogram", "unit": "us", "min": 4, "max": 96,
     "buckets": [[0, 50, 3], [50, 100, %s]]},
    {"name": "Engine", "format": "state", "unit": "ms", "states": [
      {"name": "on", "transitions": %s, "residency": %s, "duty_cycle": %s}]}]}\n' "${@:2}" >"$1/channels"
  mv -- "$1/channels" "$1/state/flume/foo.json"
}

# Lets the driver count on once the session runs: its script waits 2 s.
count_on() {
  local attempt
  for ((attempt = 0; attempt < 300; ++attempt)); do
    if grep -q 'active reporting session(s) (reporterID=.*started=1' "$1/log"; then
      write_channels "$1" 14 9 5 2500 0.25
      return
    fi
    sleep 0.05
  done
}

# The service asks two tools for its memory log and says of each what came of it. Most machines have neither tool.
check_memory_log() {
  local log=$1/log tool
  for tool in '/usr/local/bin/restop' '/usr/bin/zonetally -l'; do
    if ! grep -F "wiredlog: requesting '$tool'" "$log" >>"$details" ||
      ! grep -F -e "wiredlog: unable to execute '$tool'" -e "wiredlog: request $tool captured" "$log" >>"$details"
    then
      printf 'run: the memory log lacks %s\n' "$tool" >&2
      return 1
    fi
  done
}

# The traced session leaves a trace and its measurements.
check_traces() {
  local traces=$1/state/DiagnosticLogs/Audio/Traces files=()
  mapfile -t files < <(find "$traces" -type f \( -name '*.json' -o -name '*.pdj' \) 2>/dev/null | sort)
  if ((${#files[@]} != 2)); then
    printf 'run: %d files of the traced session, expected a trace and a perf-data file\n' "${#files[@]}" >&2
    return 1
  fi
  keep "$traces"/*.json "$kept/traced_tones.json"
  keep "$traces"/*.pdj "$kept/traced_tones.pdj"
  tells "$kept/traced_tones.json" '"name":"TarnReportingSession.sendMessage"' &&
    tells "$kept/traced_tones.pdj" '"everything Total"' && tells "$kept/traced_tones.pdj" '"everything AVG"'
}

# keep FILE PLACE: copies, whole even while another run does the same.
keep() {
  mkdir -p -- "${2%/*}"
  cp -- "$1" "$2.$$"
  mv -f -- "$2.$$" "$2"
}

# tells FILE TEXT: whether the text is in it.
tells() {
  grep -m 1 -F -e "$2" "$1" >>"$details" || {
    printf 'run: %s tells of no %s\n' "$1" "$2" >&2
    return 1
  }
}

# pass NAME TITLE PROPERTIES SCENARIO_ARGUMENT...: one service and what is played to it. Prints the end of its log when
# something went wrong.
pass() {
  local name=$1 title=$2 directory=$private/$1 properties=$3 status=0 ended=0 counting='' file
  shift 3
  mkdir -- "$directory"
  [[ $name != internal ]] || prepare_internal "$directory"
  printf '%s\n' "$properties" >"$directory/device.json"
  [[ $name != drivers ]] || write_channels "$directory" 10 7 2 1000 0.1
  "$daemon" --socket "$directory/socket" --state-dir "$directory/state" --device-properties "$directory/device.json" \
    --log-target stderr 2>"$directory/log" &
  service=$!
  if [[ $name == drivers ]]; then
    count_on "$directory" &
    counting=$!
  fi
  "$scenario" --ctl "$ctl" --socket "$directory/socket" --state-dir "$directory/state" --directory "$directory" \
    --title "$title" --details "$details" "${update[@]}" "$@" || status=1
  [[ -z $counting ]] || { wait "$counting" || true; }
  if [[ $name == internal ]]; then
    check_memory_log "$directory" || status=1
    check_traces "$directory" || status=1
  fi
  kill -TERM "$service"
  wait "$service" || ended=$?
  service=
  if ((ended != 0)); then
    printf 'run: the service ended with status %d, expected 0\n' "$ended" >&2
    status=1
  fi
  rm -f -- "$kept/$name"/*
  for file in "$directory/log" "$directory"/state/recorder.sqlite3*; do keep "$file" "$kept/$name/${file##*/}"; done
  if ((status != 0)); then
    printf 'run: the service logged:\n' >&2
    tail -n 40 -- "$directory/log" >&2 || true
  fi
  return "$status"
}

scripts=()
for name in "${together[@]}"; do scripts+=("$root/examples/$name.jsonl"); done
then=()
for name in "${afterwards[@]}"; do then+=(--then "$root/examples/$name.jsonl"); done
counted=()
for name in "${drivers[@]}"; do counted+=("$root/examples/drivers/$name.jsonl"); done
internal=()
for name in "${together_internal[@]}"; do internal+=("$root/examples/internal/$name.jsonl"); done

before=$private/before
cp -R -- "$root/examples" "$before"
status=0
printf 'Each client is a process that plays a script of examples/ to a service of its own.\n'
pass ordinary 'ordinary device' '{"InternalBuild": false, "haptics": false}' "${then[@]}" "${scripts[@]}" || status=1
pass drivers 'driver that counts' '{"InternalBuild": false, "haptics": true}' "${counted[@]}" || status=1
pass internal 'internal build' '{"InternalBuild": true, "haptics": true}' "${internal[@]}" || status=1
if ((${#update[@]} > 0)); then
  printf 'Review the difference to the expectations until now:\n'
  diff -U 0 -r -N -- "$before" "$root/examples" | cut -c 1-400 || true
  exit "$status"
fi
printf 'The internal build also left a trace of traced_tones.jsonl and what was measured in it, and its memory log.\n'
if ((status == 0)); then
  printf 'All of it arrived, in order, and nothing else.\n'
else
  printf 'NOT all of it arrived as it must.\n'
fi
keep "$details" "$kept/details.txt"
printf 'Each event with the expectation that it met: %s\n' "$kept/details.txt"
printf 'The recorders, logs and traces: %s (%s --state-dir %s events)\n' "$kept" "$ctl" "$kept/ordinary"
exit "$status"
