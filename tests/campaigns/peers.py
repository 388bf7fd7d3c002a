# SPDX-License-Identifier: Apache-2.0
"""A polite client beside hostile ones: how long it waits for its replies when it is quiet and in each attack, whether
it loses a message, and how much memory the service takes at the most.

What the service does is measured, not how the system divides the processors. So the attackers share one processor and
stand back there for service and client, and while it is quiet as many processes keep the same one as busy in the same
way: service and client have a processor when they want one, before as in the attack, and clocks and caches are those of
a machine that works. `attack_cores` and `service_cores` tell that there was an attack: how much of a processor it took,
and how much the service did. Times are judged by the whole campaign alone; a loss, a death, no reply or too much memory
in every run.
"""

import gc
import multiprocessing
import os
import random
import time

import wire
from account import FIRST, begin_session, judge, message, rows_after
from attacks import ATTACKS, PROCESSES, attack
from processors import come_first, stand_back
from service import end_with_parent, settled

KEY = 1
PAUSE = 0.002
# What the attacks may cost: so many times the quiet client's p99, and so much resident memory.
MOST_TIMES = 3.0
MOST_MIB = 128.0


class Polite:
    """One message at a time, with a pause between two."""

    def __init__(self, service, patience):
        self.key, self.next = KEY, FIRST
        self.answers, self.refused, self.settled = [], set(), FIRST - 1
        self.client = service.connect(patience)
        begin_session(self.client, KEY)

    def measure(self, seconds):
        """Waits in milliseconds, in rising order."""
        waits = []
        gc.collect()
        gc.disable()  # its pauses would be the service's
        deadline = time.monotonic() + seconds
        while time.monotonic() < deadline:
            number = self.next
            self.next += 1
            begun = time.monotonic()
            self.client.call(wire.SEND, message(KEY, number), wire.PLAYBACK, wire.PLAYBACK_START, [KEY])
            now = time.monotonic()
            self.answers.append((now, [number]))
            waits.append((now - begun) * 1000)
            time.sleep(PAUSE)
        gc.enable()
        return sorted(waits)


def percentile(waits, hundredths):
    return waits[min(len(waits) - 1, len(waits) * hundredths // 100)]


def processor_seconds(pid):
    with open(f"/proc/{pid}/stat", encoding="ascii") as file:
        fields = file.read().rpartition(")")[2].split()
    return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")


def idle_about(begun):
    """What stands for the attack while it is quiet."""
    end_with_parent()
    stand_back()
    begun()
    while True:
        pass


def attack_standing_back(*words):
    stand_back()
    attack(*words)


class Crowd:
    """Processes that play beside the polite client; ended with the block."""

    def __init__(self, count, target, words):
        fork = multiprocessing.get_context("fork")
        self.begun = fork.Event()
        self.processes = [fork.Process(target=target, args=(*words(number), self.begun.set), daemon=True)
                          for number in range(count)]

    def __enter__(self):
        for process in self.processes:
            process.start()
        return self

    def processor_seconds(self):
        return sum(processor_seconds(process.pid) for process in self.processes if process.is_alive())

    def ended(self):
        """Whether one ended before its time, by a mistake of its own or cut off for good: then there was no attack."""
        return any(process.exitcode is not None for process in self.processes)

    def __exit__(self, *_):
        for process in self.processes:
            process.kill()
            process.join()


def nobody(count):
    return Crowd(count, idle_about, lambda number: ())


def attackers(context, function, path, size):
    return Crowd(PROCESSES.get(function, 1), attack_standing_back,
                 lambda number: (function, path, random.Random(context.seed + number), size))


def let_everybody_in(context, service):
    for path in (context.folder, service.folder):
        os.chmod(path, 0o755)
    os.chmod(service.socket, 0o666)


def one_attack(context, name, function, seconds):
    """Its figures."""
    size = 0.0 if context.brief else 1.0
    patience = 15 if context.brief else 30
    service = context.new_service(before=come_first)
    if not service.start():
        raise RuntimeError(f"the service doesn't start: {service.log_text()[-500:]}")
    found = {"lost": "?", "deaths": 0, "peak_mib": 0.0}
    let_everybody_in(context, service)
    try:
        polite = Polite(service, patience)
        with nobody(PROCESSES.get(function, 1)) as crowd:
            crowd.begun.wait(60)
            quiet = polite.measure(seconds / 3)
        with attackers(context, function, service.socket, size) as crowd:
            if not crowd.begun.wait(120):
                context.fail(f"{name}: the attack couldn't be made ready")
            before = crowd.processor_seconds(), processor_seconds(service.process.pid), time.monotonic()
            beside = polite.measure(seconds * 2 / 3)
            took = time.monotonic() - before[2]
            cores = ((crowd.processor_seconds() - before[0]) / took,
                     (processor_seconds(service.process.pid) - before[1]) / took)
            if crowd.ended():
                context.fail(f"{name}: the attack itself ended early")
        found = told(quiet, beside, cores) | found
        found["lost"] = account(context, name, service, polite, patience)
    except (wire.WireError, wire.Refused) as problem:
        state = f"ended with {service.process.returncode}" if service.ends_within(1) else "lives"
        context.fail(f"{name}: the polite client isn't served: {problem} (the service {state})")
    if service.is_running():
        found["peak_mib"] = service.memory_peak()
    else:
        found["deaths"] = 1
        context.fail(f"{name}: the service ended with {service.process.returncode}: {service.log_text()[-300:]}")
    service.kill()
    return found


def told(quiet, beside, cores):
    times = {"quiet_p50": percentile(quiet, 50), "quiet_p99": percentile(quiet, 99),
             "beside_p50": percentile(beside, 50), "beside_p99": percentile(beside, 99)}
    return {"calls": len(quiet) + len(beside), **{name: f"{wait:.3f}ms" for name, wait in times.items()},
            "times": times["beside_p99"] / times["quiet_p99"], "attack_cores": f"{cores[0]:.2f}",
            "service_cores": f"{cores[1]:.2f}"}


def hold_to_bars(context, name, found):
    if found["peak_mib"] > MOST_MIB:
        context.fail(f"{name}: {found['peak_mib']:.0f} MiB were resident, {MOST_MIB:.0f} are allowed")
    # Among other tests the machine decides.
    if not context.brief and found.get("times", 0) > MOST_TIMES:
        context.fail(f"{name}: the polite client waited {found['times']:.1f} times as long, not {MOST_TIMES:.0f}")


def account(context, name, service, polite, patience):
    settled(polite.client, patience)
    reader = service.reader()
    rows = [(client, number) for _, client, number in rows_after(reader, 0) if client == KEY]
    reader.close()
    verdict = judge(rows, [polite])
    for what, keys in (("lost", verdict.late_lost), ("doubled", verdict.doubled)):
        if keys:
            context.fail(f"{name}: {what} {len(keys)} of {len(polite.answers)}, the first {keys[:3]}")
    return len(verdict.late_lost)


def run(context, figures):
    figures.update(attacks=0, deaths=0, lost=0, worst_times=0.0, worst_peak_mib=0.0)
    chosen = [function for function in ATTACKS if context.only in ("", function.__name__)]
    if not chosen:
        raise ValueError(f"there is no attack {context.only!r}: {' '.join(one.__name__ for one in ATTACKS)}")
    come_first(rank=3)
    for function in chosen:
        name = function.__name__
        context.begin_part()
        found = one_attack(context, name, function, context.seconds / len(chosen))
        hold_to_bars(context, name, found)
        context.tell_part(name, found)
        figures["attacks"] += 1
        figures["deaths"] += found["deaths"]
        figures["lost"] += found["lost"] if found["lost"] != "?" else 0
        figures["worst_times"] = max(figures["worst_times"], found.get("times", 0.0))
        figures["worst_peak_mib"] = max(figures["worst_peak_mib"], found["peak_mib"])
