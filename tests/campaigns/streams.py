# SPDX-License-Identifier: Apache-2.0
"""200 streams a minute of a real PipeWire, for as long as it is given: each has its session, as long as it ran, and
none stays open. With a session manager that links them, and with the tests' own PipeWire, which has no hardware.
"""

import os
import shutil
import sys
import time

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "e2e", "pipewire"))
from headless import Machine, eventually  # noqa: E402

STREAMS_A_SECOND = 200 / 60
# By how much pw-play's files are longer than what is heard of them at the least: what it can't know of them.
TOLERANCE = 0.1
NEEDED = ("pipewire", "wireplumber", "pw-play", "pw-dump")


def run(context, figures):
    figures.update(streams=0, sessions=0, open=0, unpaired=0, short=0, longest_late_ms=0.0, adapter_rss_kib=0)
    folder = os.path.dirname(context.service_program)
    programs = [os.path.join(folder, name) for name in ("tarnreportingd", "tarnreportingctl", "tarnreporting-pipewire")]
    missing = [name for name in NEEDED if not shutil.which(name)]
    missing += [program for program in programs if not os.path.exists(program)]
    if missing:
        context.fail("it needs " + ", ".join(missing))
        return
    machine = Machine(True, programs)
    try:
        machine.start()
        lengths = play(context, machine)
        figures["streams"] = len(lengths)
        judge(context, figures, machine, lengths)
    finally:
        machine.close()


def play(context, machine):
    """Starts a stream whenever it is time for one, and waits for all to end. Their seconds by name."""
    lengths, players = {}, []
    begun = time.monotonic()
    while context.left() > 0:
        while len(lengths) < (time.monotonic() - begun) * STREAMS_A_SECOND:
            name, seconds = f"stream{len(lengths)}", context.random.choice((0.25, 0.5, 1, 2))
            players.append(machine.play(name, seconds, role=context.random.choice(("Music", "Game", "Notification"))))
            lengths[name] = seconds
        time.sleep(0.02)
    machine.finish(*players)
    return lengths


def judge(context, figures, machine, lengths):
    eventually(lambda: len(machine.sessions()) >= len(lengths) and all(row["ended"] for row in machine.sessions()))
    sessions = machine.sessions()
    figures["sessions"] = len(sessions)
    figures["open"] = sum(not session["ended"] for session in sessions)
    names = [session["application"].removeprefix("org.test.") for session in sessions]
    if sorted(names) != sorted(lengths):
        context.fail(f"{len(lengths)} streams and {len(sessions)} sessions: "
                     f"without {sorted(set(lengths) - set(names))[:5]}, doubled {len(names) - len(set(names))}")
    if figures["open"]:
        context.fail(f"{figures['open']} sessions stayed open")
    for session, name in zip(sessions, names):
        one_stream(context, figures, machine, session, name, lengths.get(name, 0))
    with open(f"/proc/{machine.adapter.pid}/status", encoding="utf-8") as file:
        figures["adapter_rss_kib"] = int(next(line for line in file if line.startswith("VmHWM")).split()[1])


def one_stream(context, figures, machine, session, name, seconds):
    starts = machine.messages(session, "Playback.Start")
    stops = machine.messages(session, "Playback.Stop")
    if len(starts) != len(stops) or not starts:
        figures["unpaired"] += 1
        context.fail(f"{name}: {len(starts)} starts and {len(stops)} stops")
        return
    ran = sum(stop["tarnreporting_timestamp"] for stop in stops)
    ran -= sum(start["tarnreporting_timestamp"] for start in starts)
    figures["longest_late_ms"] = max(figures["longest_late_ms"], (ran - seconds) * 1000)
    if ran < seconds - TOLERANCE:
        figures["short"] += 1
        context.fail(f"{name}: ran {ran:.3f} s of {seconds} s")
