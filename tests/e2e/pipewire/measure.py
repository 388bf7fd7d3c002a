# SPDX-License-Identifier: Apache-2.0
"""What the adapter costs: asleep beside streams that only play, and while streams come and go.

usage: measure.py PROGRAMS STREAMER [SECONDS]

Prints a line each with the processor time as a share of one core, the wake-ups a second (voluntary switches of all its
threads) and the memory at the most.
"""

import os
import subprocess
import sys
import time

from headless import Machine, eventually

IDLE_STREAMS = 5
RATE = 200


def switches(pid):
    total = 0
    for thread in os.listdir(f"/proc/{pid}/task"):
        with open(f"/proc/{pid}/task/{thread}/status", encoding="utf-8") as file:
            total += sum(int(line.split()[1]) for line in file if line.startswith("voluntary_ctxt"))
    return total


def seconds_of(pid):
    with open(f"/proc/{pid}/stat", encoding="utf-8") as file:
        fields = file.read().rsplit(")", 1)[1].split()
    return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")


def memory(pid):
    with open(f"/proc/{pid}/status", encoding="utf-8") as file:
        return next(int(line.split()[1]) for line in file if line.startswith("VmHWM"))


def measure(machine, name, seconds, work=time.sleep):
    pid = machine.adapter.pid
    before = seconds_of(pid), switches(pid), time.monotonic()
    streams = work(seconds)
    took = time.monotonic() - before[2]
    used = seconds_of(pid) - before[0]
    rate = ""
    if streams:
        heard = f" (sound in {streams[1] / took:.0f})" if len(streams) > 1 else ""
        rate = f", {streams[0] / took:.0f} streams a second{heard}, {used / streams[0] * 1e6:.0f} us each"
    print(f"{name}: {used / took * 100:.3f} % of a core, {(switches(pid) - before[1]) / took:.1f} wake-ups a second, "
          f"{memory(pid) / 1024:.1f} MiB at the most{rate}", flush=True)


def churn(machine, streamer, *words):
    """Streams that come and go: as fast as they can, or so many a second."""
    def work(seconds):
        churner = streamer.replace("streamer", "churner")
        answer = subprocess.run([churner, str(seconds), *words], env=machine.environment, text=True, check=True,
                                stdout=subprocess.PIPE, stdin=subprocess.DEVNULL)
        return [int(word) for word in answer.stdout.split()]
    return work


def main(programs, streamer, seconds=10):
    for words, kind in (((), "profiler on"), (("--config", "quiet"), "profiler off")):
        machine = Machine(True, [os.path.join(programs, name) for name in
                                 ("tarnreportingd", "tarnreportingctl", "tarnreporting-pipewire")])
        try:
            if words:
                words = ("--config", machine.write("quiet.toml", "[report]\nprofiler = false\n"))
            machine.start(*words)
            time.sleep(2)
            measure(machine, f"no streams, {kind}", seconds)
            for i in range(IDLE_STREAMS):
                machine.spawn(streamer, f"idle{i}", "3600", stdout=subprocess.DEVNULL)
            assert eventually(lambda: machine.runs(f"idle{IDLE_STREAMS - 1}"))
            time.sleep(3)
            measure(machine, f"{IDLE_STREAMS} streams that play, {kind}", seconds)
            measure(machine, f"streams that come and go, {kind}", seconds, churn(machine, streamer))
            measure(machine, f"that nobody links, {kind}", seconds, churn(machine, streamer, "bare", str(RATE)))
            measure(machine, f"that link themselves, {kind}", seconds, churn(machine, streamer, "link", str(RATE)))
            measure(machine, f"that start and stop, {kind}", seconds, churn(machine, streamer, "pause", str(RATE)))
        finally:
            machine.close()


if __name__ == "__main__":
    main(sys.argv[1], sys.argv[2], *map(int, sys.argv[3:]))
