# SPDX-License-Identifier: Apache-2.0
"""One allocation after the other fails while a client plays a scenario: alone, fifty in a row, and more than the
service keeps in reserve. So do those of a start and of an end.

The service may refuse that client's requests or close its connection. It lives, leaves nothing of that client behind,
serves another client, whose messages are in the store once, accounts for every message, and ends in order. A start may
fail, with a line and a status.

All of them are tens of thousands. PART is a share of the ordinals, as 2of3: three processes with one seed try all.
"""

import time

import control
import wire
from account import FIRST, begin_session, judge, message, rows_after
from scenarios import SCENARIOS
from service import settled

POLITE = 1
PATIENCE = 10
# Beyond what a scenario allocated when it was counted: the recorder's thread allocates when it pleases.
MARGIN = 3
# How many fail in a row. Every ordinal fails alone; of the others, which take longer, one in so many is tried.
IN_A_ROW = {1: 1, 50: 4, 200: 8}
# Trials after which the service ends in order and is begun anew.
LIFE = 400
# The share of trials that are starts and ends, which take a process each.
ENDS_EACH = 40
OUTCOMES = ("delivered", "redundant", "unwanted", "undeliverable", "without_session", "refused")


class Polite:
    """The other client: its connection stays, and each of its messages must be answered and be there."""

    def __init__(self, service, key):
        self.key, self.next = key, FIRST
        self.answers, self.refused, self.settled = [], set(), FIRST - 1
        self.client = service.connect(PATIENCE)
        begin_session(self.client, key)
        self.say()  # the start, which isn't answered before the stop, is served when this is

    def say(self):
        number = self.next
        self.next += 1
        self.client.call(wire.SEND, message(self.key, number), wire.PLAYBACK, wire.PLAYBACK_START, [self.key])
        self.answers.append((time.monotonic(), [number]))


class Trials:
    def __init__(self, context, figures):
        self.context, self.figures = context, figures
        self.control = context.new_control()
        self.environment = self.control.environment(context.shim("allocations"))
        self.service = context.new_service(environment=self.environment)
        self.polites = []
        self.trials = 0

    def begin(self):
        """Starts the service when it doesn't run, with a polite client of its own."""
        if self.service.is_running():
            return
        self.control.forget()
        self.service.forget_log()
        if not self.service.start():
            raise RuntimeError(f"the service doesn't start: {self.service.log_text()[-500:]}")
        self.polites.append(Polite(self.service, POLITE + len(self.polites)))
        self.trials = 0

    def let_fail(self, ordinal, in_a_row=1):
        self.control[control.ALLOCATIONS] = 0
        self.control[control.FAILURES_IN_A_ROW] = in_a_row
        self.control[control.FAILING_ALLOCATION] = ordinal

    def let_work(self):
        self.control[control.FAILING_ALLOCATION] = 0

    def play(self, scenario, failing, in_a_row=1):
        """Plays with these allocations failing (COUNT_ONLY: none). What is wrong, if something is."""
        client = None
        try:
            client = self.service.connect(PATIENCE)
            self.let_fail(failing, in_a_row)
            scenario(client, self.service)
            # What the recorder and the connection's end allocate belongs to it too.
            client.close()
            if not self.service.comes_to_rest(lambda: self.control[control.ALLOCATIONS], PATIENCE):
                return f"it doesn't come to rest within {PATIENCE} s"
        except (wire.WireError, wire.Refused, AssertionError, OSError) as problem:
            if failing == control.COUNT_ONLY:
                raise RuntimeError(f"{scenario.__name__} fails by itself: {problem}") from problem
            if "in time" in str(problem):
                return f"no reply within {PATIENCE} s"
        finally:
            self.let_work()
            if client is not None:
                client.close()
        return None

    def count(self, scenario):
        self.begin()
        self.play(scenario, control.COUNT_ONLY)  # what is made once for all is made
        self.play(scenario, control.COUNT_ONLY)
        return self.control[control.ALLOCATIONS]

    def one(self, scenario, ordinal, in_a_row):
        self.begin()
        fired = self.control[control.FIRED]
        problem = self.play(scenario, ordinal, in_a_row)
        self.figures["fired"] += self.control[control.FIRED] - fired
        problem = problem or self.is_well()
        self.trials += 1
        if not problem and self.trials >= LIFE:
            self.account()
        return problem

    def is_well(self):
        try:
            self.polites[-1].say()
            with self.service.connect(PATIENCE) as fresh:
                return self.what_is_left(fresh)
        except (wire.WireError, wire.Refused, OSError) as problem:
            if self.service.ends_within(2):
                return self.death()
            why = f"the other client isn't served: {problem}; cut {self.cuts()}; {self.last_line()}"
            self.service.kill()  # the next trial begins anew
            return why

    def cuts(self):
        """Why connections were cut so far, as the service counts it."""
        try:
            with self.service.connect(PATIENCE) as fresh:
                cut = fresh.call(wire.STATUS)["connections_cut"]
        except (wire.WireError, wire.Refused, OSError) as problem:
            return f"unknown ({problem})"
        return {reason: count for reason, count in cut.items() if count}

    def what_is_left(self, fresh):
        """What the service still has of a client that is gone; it may take a moment to end it."""
        deadline = time.monotonic() + PATIENCE
        while True:
            status = fresh.call(wire.STATUS)
            # The polite client and this one; the session for messages without one stays for some seconds.
            gone = status["connections_open"] == 2 and status["sessions"] <= 2 and status["messages_waiting"] == 0
            if gone or time.monotonic() > deadline:
                break
            time.sleep(0.002)
        if not gone:
            return "left behind: " + ", ".join(f"{name} {status[name]}" for name in
                                               ("connections_open", "sessions", "messages_waiting"))
        dealt = sum(status["messages_" + outcome] for outcome in OUTCOMES)
        if dealt != status["messages_received"]:
            return f"the ledger doesn't close: {dealt} of {status['messages_received']} messages"
        return None

    def death(self):
        self.figures["deaths"] += 1
        return f"the service died with {self.service.process.returncode}: {self.last_line()}"

    def last_line(self):
        lines = self.service.log_text().strip().splitlines()
        return lines[-1][-200:] if lines else "no line"

    def account(self):
        """The polite client that is connected now must find all it said. Ends the service in order."""
        if not self.service.is_running():
            return
        polite = self.polites[-1]
        settled(polite.client)
        shortage = polite.client.call(wire.STATUS)["out_of_memory"]
        for name in ("requests_refused", "connections_closed", "work_given_up", "reserve_blocks_used"):
            self.figures[name] += shortage[name]
        status = self.service.stop()
        if status != 0:
            self.context.fail(f"status {status} at the end")
        self.look_for_messages(polite)
        polite.client.close()

    def look_for_messages(self, polite):
        reader = self.service.reader()
        rows = [(client, number) for _, client, number in rows_after(reader, 0)]
        reader.close()
        verdict = judge(rows, [polite])
        for name, keys in (("lost", verdict.late_lost), ("doubled", verdict.doubled)):
            self.figures[name] += len(keys)
            if keys:
                self.context.fail(f"the other client's messages: {name} {len(keys)}, the first {keys[:3]}")

    # A start and an end of the service, each with allocations that fail.

    def count_life(self):
        """Allocations of a start and of an end with a client that has a session."""
        self.account()
        self.control.forget()
        self.let_fail(control.COUNT_ONLY)
        self.service.start()
        start = self.control[control.ALLOCATIONS]
        polite = Polite(self.service, POLITE + len(self.polites))
        self.polites.append(polite)
        self.let_fail(control.COUNT_ONLY)
        self.service.stop()
        polite.client.close()
        return start, self.control[control.ALLOCATIONS]

    def one_start(self, ordinal, in_a_row):
        self.account()
        self.control.forget()
        self.service.forget_log()
        self.let_fail(ordinal, in_a_row)
        ready = self.service.start()
        self.let_work()
        self.figures["fired"] += self.control[control.FIRED]
        if ready:
            self.polites.append(Polite(self.service, POLITE + len(self.polites)))
            problem = self.is_well()
            self.account()  # what the runtime couldn't set up is missed later, and belongs to this trial
            return problem
        status = self.service.process.returncode
        if status <= 0 or not self.service.log_text().strip():
            return f"status {status} and {self.service.log_text()[-200:]!r}"
        return None

    def one_end(self, ordinal, in_a_row):
        self.begin()
        polite = self.polites[-1]
        polite.say()
        settled(polite.client)
        fired = self.control[control.FIRED]
        self.let_fail(ordinal, in_a_row)
        status = self.service.stop()
        self.figures["fired"] += self.control[control.FIRED] - fired
        self.let_work()
        if status != 0:
            return f"status {status}: {self.service.log_text()[-200:]!r}"
        self.look_for_messages(polite)
        polite.client.close()
        return None


def ordinal_of(trial):
    return trial[2][-2]


def step_of(trial):
    """How far the ordinals of such trials are apart."""
    return IN_A_ROW[trial[2][-1]]


def all_trials(context, trials):
    """(name, function, arguments) of each: every ordinal of every scenario, and beside them starts and ends."""
    share, shares = context.share()
    scenes, lives = [], []
    counts = {scenario: trials.count(scenario) + MARGIN for scenario in SCENARIOS}
    start, end = trials.count_life()
    for many, step in IN_A_ROW.items():
        first = context.random.randint(1, step)
        for scenario, count in counts.items():
            scenes += [(scenario.__name__, trials.one, (scenario, ordinal, many))
                       for ordinal in range(first, count + 1, step)]
        lives += [("start", trials.one_start, (ordinal, many)) for ordinal in range(first, start + 1, step)]
        lives += [("end", trials.one_end, (ordinal, many)) for ordinal in range(first, end + 1, step)]
    # By ordinal, as each process counts for itself.
    scenes, lives = ([trial for trial in each if ordinal_of(trial) // step_of(trial) % shares == share]
                     for each in (scenes, lives))
    context.random.shuffle(scenes)
    context.random.shuffle(lives)
    mixed = []
    while scenes or lives:
        mixed += scenes[-ENDS_EACH:] + lives[-1:]
        del scenes[-ENDS_EACH:], lives[-1:]
    return mixed


def run(context, figures):
    figures.update(scenarios=len(SCENARIOS) + 2, tried=0, of=0, fired=0, survived=0, deaths=0, lost=0, doubled=0,
                   requests_refused=0, connections_closed=0, work_given_up=0, reserve_blocks_used=0)
    trials = Trials(context, figures)
    planned = all_trials(context, trials)
    figures["of"] = len(planned)
    try:
        play(context, figures, trials, planned)
    finally:  # hours of work
        if context.only:
            context.tell_part(context.only, figures)


def play(context, figures, trials, planned):
    for name, trial, arguments in planned:
        if context.left() <= 0:
            break
        problem = trial(*arguments)
        figures["tried"] += 1
        if problem:
            ordinal, many = arguments[-2:]
            context.fail(f"allocation {ordinal} of {name}, {many} in a row: {problem}")
        else:
            figures["survived"] += 1
    trials.account()
