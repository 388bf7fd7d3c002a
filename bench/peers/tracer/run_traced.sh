#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Runs a program while a tracer of our own records its tracepoints, into memory that holds all of them: what is
# discarded is cheaper than what is kept. Prints what the program prints, nothing when there is no tracer.
#
# usage: run_traced.sh FOLDER PROGRAM [ARGUMENT...]
set -eu

folder=$1
shift
command -v lttng >/dev/null && command -v lttng-sessiond >/dev/null || exit 0
# Somebody else's session daemon is not for us.
! lttng --no-sessiond list >/dev/null 2>&1 || exit 0
export LTTNG_HOME=$folder HOME=$folder LTTNG_UST_REGISTER_TIMEOUT=-1
lttng-sessiond --no-kernel >/dev/null 2>&1 &
daemon=$!
finish() {
  lttng --no-sessiond destroy tarnbench >/dev/null 2>&1 || true
  kill "$daemon" 2>/dev/null || true
  wait "$daemon" 2>/dev/null || true
}
trap finish EXIT
for _ in $(seq 100); do
  ! lttng --no-sessiond list >/dev/null 2>&1 || break
  sleep 0.05
done
{
  lttng --no-sessiond create tarnbench "--output=$folder/trace"
  lttng --no-sessiond enable-channel -u all --subbuf-size=64M --num-subbuf=2
  lttng --no-sessiond enable-event -u 'tarnbench:*' -c all
  lttng --no-sessiond start
} >/dev/null 2>&1
timeout 60 "$@"
