"""A polite client beside hostile ones: how long it waits for its replies when it is quiet and in each attack, whether
it loses a message, and how much memory the service takes at the most. No time is judged; a loss, a death or no reply
is.
"""

import multiprocessing
import os
import random
import time

import wire
from account import FIRST, begin_session, judge, message, rows_after
from attacks import ATTACKS, PROCESSES, attack
from service import settled

KEY = 1
PAUSE = 0.002


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
        return sorted(waits)


def p99(waits):
    return waits[min(len(waits) - 1, len(waits) * 99 // 100)]


class Attackers:
    """The attacking processes; ended with the block."""

    def __init__(self, context, function, path, size):
        self.begun = multiprocessing.get_context("fork").Event()
        self.processes = [
            multiprocessing.get_context("fork").Process(
                target=attack, args=(function, path, random.Random(context.seed + number), size, self.begun.set),
                daemon=True)
            for number in range(PROCESSES.get(function, 1))]

    def __enter__(self):
        for process in self.processes:
            process.start()
        return self

    def broke(self):
        """Whether one ended by a mistake of its own: then there was no attack. Being cut off for good is none."""
        return any(process.exitcode not in (None, 0) for process in self.processes)

    def __exit__(self, *_):
        for process in self.processes:
            process.kill()
            process.join()


def let_everybody_in(context, service):
    for path in (context.folder, service.folder):
        os.chmod(path, 0o755)
    os.chmod(service.socket, 0o666)


def one_attack(context, figures, function, seconds):
    name = function.__name__
    size = 0.0 if context.brief else 1.0
    patience = 15 if context.brief else 30
    service = context.new_service()
    if not service.start():
        raise RuntimeError(f"the service doesn't start: {service.log_text()[-500:]}")
    quiet = waits = None
    let_everybody_in(context, service)
    try:
        polite = Polite(service, patience)
        quiet = polite.measure(seconds / 3)
        with Attackers(context, function, service.socket, size) as attackers:
            if not attackers.begun.wait(60):
                context.fail(f"{name}: the attack couldn't be made ready")
            waits = polite.measure(seconds * 2 / 3)
            if attackers.broke():
                context.fail(f"{name}: the attack itself ended early")
        lost = account(context, name, service, polite, patience)
    except (wire.WireError, wire.Refused) as problem:
        lost = "?"
        state = f"ended with {service.process.returncode}" if service.ends_within(1) else "lives"
        context.fail(f"{name}: the polite client isn't served: {problem} (the service {state})")
    if not service.is_running():
        figures["deaths"] += 1
        context.fail(f"{name}: the service ended with {service.process.returncode}: {service.log_text()[-300:]}")
        peak = 0.0
    else:
        peak = service.memory_peak()
    service.kill()
    figures["worst_peak_mib"] = max(figures["worst_peak_mib"], peak)
    figures[name] = told(quiet, waits, lost, peak)


def told(quiet, waits, lost, peak):
    """quiet p99 -> p99 in the attack, how many times it is, messages lost, resident MiB at the most."""
    if not quiet or not waits:
        return f"?/lost:{lost}/{peak:.0f}MiB"
    before, beside = p99(quiet), p99(waits)
    return f"{before:.2f}->{beside:.2f}ms/x{beside / before:.1f}/lost:{lost}/{peak:.0f}MiB"


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
    figures.update(attacks=len(ATTACKS), deaths=0, worst_peak_mib=0.0)
    for function in ATTACKS:
        one_attack(context, figures, function, context.seconds / len(ATTACKS))
