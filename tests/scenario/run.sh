#!/usr/bin/env bash
# Plays the example scripts against services of their own and checks what arrived.
# usage: tests/scenario/run.sh [BUILD_DIR]
# Three passes: an ordinary device, one with a driver that counts, then an internal build. Each service gets private
# directories, which go at the end, but for what the traced session leaves: that is kept in BUILD_DIR/scenario.
# Exit status 0 only when everything arrived and all services ended cleanly.
set -euo pipefail

root=$(cd -- "$(dirname -- "${BASH_SOURCE[0]}")/../.." && pwd -P)
build=${1:-$root/build}
[[ $build == /* ]] || build=$PWD/$build
daemon=$build/bin/tarnreportingd
scenario=$build/bin/tarnreportingscenario
ctl=$build/bin/tarnreportingctl
for program in "$daemon" "$scenario" "$ctl"; do
  [[ -x $program ]] || { printf 'run: %s is not built\n' "$program" >&2; exit 64; }
done

# Played at once, each by a process of its own; then, alone, what only makes sense when nothing else runs.
together=(music_player call group_session haptics_engine alarm system_sounds api_usage dictation game_audio test_tones)
afterwards=(one_shots)
# Alone on a device with a driver that counts.
drivers=(rumble)
# At once on the internal build.
together_internal=(voice_memo haptics_leak stuck_sound quiet_alarm faulty_call traced_tones)

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

# What the internal pass needs before its service starts: the defaults that switch diagnostics on, the probes of the
# traced session, and the scripts themselves, with the directory filled in.
prepare_internal() {
  local directory=$1 suite=sys.oxbow.tarnkit.tarnreporting name
  "$ctl" --state-dir "$directory/state" defaults write "$suite" ParleyInvalidXyBackOffSeconds 3600
  "$ctl" --state-dir "$directory/state" defaults write "$suite" enable_gyre true
  "$ctl" --state-dir "$directory/state" defaults write "$suite" wait_time 1000
  cat >"$directory/probes.plist" <<'PLIST'
<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0"><array>
<dict><key>name</key><string>everything</string><key>signpost</key><string>*</string></dict>
</array></plist>
PLIST
  for name in "$root"/examples/internal/*.jsonl; do
    sed "s|@DIRECTORY@|$directory|g" "$name" >"$directory/${name##*/}"
  done
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
  printf 'memory log\n'
  for tool in '/usr/local/bin/restop' '/usr/bin/zonetally -l'; do
    if ! grep -F "wiredlog: requesting '$tool'" "$log" | cut -c 1-160 ||
      ! grep -F -e "wiredlog: unable to execute '$tool'" -e "wiredlog: request $tool captured" "$log" | cut -c 1-160
    then
      printf 'run: the memory log lacks %s\n' "$tool" >&2
      return 1
    fi
  done
}

# The traced session leaves a trace and its measurements.
check_traces() {
  local traces=$1/state/DiagnosticLogs/Audio/Traces kept=$build/scenario files=()
  mapfile -t files < <(find "$traces" -type f \( -name '*.json' -o -name '*.pdj' \) 2>/dev/null | sort)
  if ((${#files[@]} != 2)); then
    printf 'run: %d files of the traced session, expected a trace and a perf-data file\n' "${#files[@]}" >&2
    return 1
  fi
  printf 'the traced session\n'
  show_trace "$(keep "$traces"/*.json "$kept/traced_tones.json")" &&
    show_measurements "$(keep "$traces"/*.pdj "$kept/traced_tones.pdj")"
}

# keep FILE PLACE: copies, whole even while another run does the same; prints the place.
keep() {
  mkdir -p -- "${2%/*}"
  cp -- "$1" "$2.$$"
  mv -f -- "$2.$$" "$2"
  printf '%s\n' "$2"
}

show_trace() {
  printf '  trace %s: %d bytes\n' "$1" "$(stat -c %s "$1")"
  grep -m 3 -F '"name":"TarnReportingSession.sendMessage"' "$1" | cut -c 1-160 | sed 's/^/    /' || {
    printf 'run: the trace tells of no message\n' >&2
    return 1
  }
}

show_measurements() {
  printf '  perf data %s: %d bytes\n' "$1" "$(stat -c %s "$1")"
  grep -F -e '"everything Total"' -e '"everything AVG"' "$1" | cut -c 1-160 | sed 's/^/    /' || {
    printf 'run: the perf data has no measurement of the probe\n' >&2
    return 1
  }
}

# pass NAME PROPERTIES SCENARIO_ARGUMENT...: one service and what is played to it. Prints the end of its log when
# something went wrong.
pass() {
  local name=$1 directory=$private/$1 properties=$2 status=0 ended=0 counting=
  shift 2
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
  "$scenario" --ctl "$ctl" --socket "$directory/socket" --state-dir "$directory/state" "$@" || status=1
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
for name in "${together_internal[@]}"; do internal+=("$private/internal/$name.jsonl"); done

status=0
pass ordinary '{"InternalBuild": false, "haptics": false}' "${then[@]}" "${scripts[@]}" || status=1
pass drivers '{"InternalBuild": false, "haptics": true}' "${counted[@]}" || status=1
pass internal '{"InternalBuild": true, "haptics": true}' --internal-build "${internal[@]}" || status=1
exit "$status"
