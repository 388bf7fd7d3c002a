# SPDX-License-Identifier: Apache-2.0
"""The service ends and starts again with a socket that stays, as under a service manager, while programs report some
5,000 messages a second by the C, C++ and Python libraries: no call of theirs ever fails, what was posted is there once,
but for what a kill may cost, and each period of a session has its one summary.
"""

import signal
import statistics
import threading
import time

from account import FIRST
from rings import (COMMITTED_MESSAGES, POSTED, TAKEN_MESSAGES, Player, Poster, PythonPoster, doubled, eventually,
                   missing, numbers_after)
from service import settled
import wire

RESTARTS_A_STORE = 25
# How old what a kill costs may be, in seconds.
WINDOW = 0.2
PERIODS = ("SELECT s.id, s.end_reason, p.stopped, (SELECT count(*) FROM events AS e WHERE e.session = s.id AND "
           "e.name = 'sys.oxbow.tarnkit.Session_Generic.Summary') "
           "FROM sessions AS s JOIN periods AS p ON p.session = s.id")


def run(context, figures):
    figures.update(restarts=0, kills=0, posted=0, recorded=0, lost=0, doubled=0, lost_by_kills=0, late_lost=0,
                   oldest_lost_ms=0.0, periods=0, odd_periods=0, odd_programs=0)
    waits = {signal.SIGTERM: [], signal.SIGKILL: []}
    while context.left() > 0 and not context.failures:
        one_store(context, figures, waits)
    for number, name in ((signal.SIGTERM, "restart"), (signal.SIGKILL, "after_kill")):
        if waits[number]:
            figures[f"{name}_median_ms"] = statistics.median(waits[number])
            figures[f"{name}_worst_ms"] = max(waits[number])


def one_store(context, figures, waits):
    """Some restarts of one service, all by the same signal, and the account of its store then."""
    service = context.new_service(holds_socket=True)
    if not service.start():
        context.fail(f"no first start: {service.log_text()[-500:]}")
        return
    programs = [Poster(context, service, 1, 2, 1500), Player(context, service, 11, 1000),
                PythonPoster(context, service, 21, 1000)]
    for program in programs:
        program.hold_rings()
    number = signal.SIGKILL if context.random.random() < 0.3 else signal.SIGTERM
    diary = Diary(programs)
    diary.start()
    for _ in range(RESTARTS_A_STORE):
        time.sleep(context.random.uniform(0.02, 0.4))
        restart(context, figures, service, number, (diary, waits[number]))
        if context.failures or context.left() <= 0:
            break
    diary.end()
    if not context.failures:
        look(context, figures, service, programs, diary)
    for program in programs:
        program.kill()
    service.kill()


def restart(context, figures, service, number, notes):
    """Ends it, starts it at once, and notes how many milliseconds it took until it answered again."""
    diary, waits = notes
    begun = time.monotonic()
    status = service.stop(number)
    if number == signal.SIGKILL:
        figures["kills"] += 1
        diary.killed(begun)
    else:
        figures["restarts"] += 1
    if status != (-number if number == signal.SIGKILL else 0):
        context.fail(f"restart {figures['restarts']}: status {status} at the end: {service.log_text()[-500:]}")
    elif not service.start():
        context.fail(f"no start after end {figures['restarts'] + figures['kills']}: {service.log_text()[-500:]}")
    else:
        with service.connect() as client:
            client.call(wire.STATUS)
        waits.append((time.monotonic() - begun) * 1000)


class Diary(threading.Thread):
    """What of each ring was taken when, and so what a kill may cost: `allowed` has the messages of each key that were
    taken and not committed when the service was killed, and how many seconds before that at the least."""

    def __init__(self, programs):
        super().__init__(daemon=True)
        self.programs = programs
        self.stopping = threading.Event()
        self.pages = []
        self.allowed = {key: {} for program in programs for key in program.keys}

    def run(self):
        while not self.stopping.wait(0.005):
            numbers = self.numbers(TAKEN_MESSAGES)
            self.pages.append((time.monotonic(), numbers))  # taken by then, or before

    def end(self):
        self.stopping.set()
        self.join()

    def numbers(self, at):
        return {key: number for program in self.programs for key, number in zip(program.keys, program.numbers(at))}

    def killed(self, when):
        """Nobody has the rings open now."""
        taken, committed = self.numbers(TAKEN_MESSAGES), self.numbers(COMMITTED_MESSAGES)
        pages, self.pages = [*self.pages, (when, taken)], []
        for key, begin in committed.items():
            for time_of, numbers in pages:
                for number in range(begin, numbers[key]):
                    self.allowed[key].setdefault(FIRST + number, max(0, when - time_of))
                begin = max(begin, numbers[key])


def look(context, figures, service, programs, diary):
    for program in programs:
        status, complaints = program.end()
        if status != 0 or complaints:
            figures["odd_programs"] += 1
            context.fail(f"{program.name} ended with {status} after {figures['restarts']} restarts and "
                         f"{figures['kills']} kills: {complaints[-300:]}")
    with service.connect() as client:
        if not eventually(lambda: client.call(wire.STATUS)["rings_open"] == 0):
            context.fail("the rings of programs that ended stay open")
        settled(client)
    found, _ = numbers_after(service, 0)
    for program in programs:
        for key, posted in zip(program.keys, program.numbers(POSTED)):
            judge_ring(context, figures, diary, (key, posted, found.get(key, {})))
    # The last sessions end with it.
    if service.stop() != 0:
        context.fail(f"status {service.process.returncode} at the last end: {service.log_text()[-500:]}")
    judge_periods(context, figures, service)


def judge_ring(context, figures, diary, ring):
    key, posted, numbers = ring
    lost, twice = missing(numbers, posted), doubled(numbers) if numbers else []
    allowed = diary.allowed[key]
    unexplained = [number for number in lost if number not in allowed]
    late = [number for number in lost if allowed.get(number, 0) > WINDOW]
    figures["oldest_lost_ms"] = max([figures["oldest_lost_ms"], *(allowed.get(number, 0) * 1000 for number in lost)])
    for name, count in (("posted", posted), ("recorded", len(numbers)), ("lost", len(unexplained)),
                        ("lost_by_kills", len(lost) - len(unexplained)), ("late_lost", len(late)),
                        ("doubled", len(twice))):
        figures[name] += count
    if unexplained or twice:
        context.fail(f"ring {key}: {len(unexplained)} lost, the first {unexplained[:3]}; {len(twice)} twice, the first "
                     f"{twice[:3]}; of {posted} from {FIRST} on")
    if late and not context.brief:
        context.fail(f"ring {key}: kills cost {len(late)} messages older than {WINDOW} s, the first {late[:3]}")
    if len(numbers) > posted:
        context.fail(f"ring {key}: {posted} were posted, {len(numbers)} are recorded")


def judge_periods(context, figures, service):
    """What a kill ended has no summary, or the one of a stop whose own note was not committed any more."""
    reader = service.reader()
    for session, reason, stopped, summaries in reader.execute(PERIODS):
        figures["periods"] += 1
        if (summaries != 1 or stopped is None) and (reason != "killed" or summaries > 1):
            figures["odd_periods"] += 1
            context.fail(f"session {session}, {reason}, stopped {stopped}: {summaries} summaries of its only period")
    reader.close()
