"""One allocation after the other fails while a client plays a scenario. The service may refuse that client's request or
close its connection; it lives, another client beside it is served, and that one's messages are in the store once.
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


class Polite:
    """The other client: its connection stays, and each of its messages must be answered and be there."""

    def __init__(self, service, key):
        self.key, self.next = key, FIRST
        self.answers, self.refused, self.settled = [], set(), FIRST - 1
        self.client = service.connect(PATIENCE)
        begin_session(self.client, key)

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
        self.service = context.new_service("", environment=self.environment)
        self.polites = []

    def begin(self):
        """Starts the service when it doesn't run, with a polite client of its own."""
        if self.service.is_running():
            return
        self.control.forget()
        self.service.forget_log()
        if not self.service.start():
            raise RuntimeError(f"the service doesn't start: {self.service.log_text()[-500:]}")
        self.polites.append(Polite(self.service, POLITE + len(self.polites)))

    def play(self, scenario, failing):
        """Plays with that allocation failing (COUNT_ONLY: none); the allocations that were made."""
        client = None
        try:
            client = self.service.connect(PATIENCE)
            self.control[control.ALLOCATIONS] = 0
            self.control[control.FAILING_ALLOCATION] = failing
            scenario(client, self.service)
            # What the recorder and the connection's end allocate belongs to it too.
            client.close()
            time.sleep(0.002)
        except (wire.WireError, wire.Refused, AssertionError, OSError) as problem:
            if failing == control.COUNT_ONLY:
                raise RuntimeError(f"{scenario.__name__} fails by itself: {problem}") from problem
            if "in time" in str(problem):
                return f"no reply within {PATIENCE} s"
        finally:
            self.control[control.FAILING_ALLOCATION] = 0
            if client is not None:
                client.close()
        return None

    def count(self, scenario):
        self.begin()
        self.play(scenario, control.COUNT_ONLY)  # what is made once for all is made
        self.play(scenario, control.COUNT_ONLY)
        return self.control[control.ALLOCATIONS]

    def one(self, scenario, ordinal):
        self.begin()
        fired = self.control[control.FIRED]
        problem = self.play(scenario, ordinal)
        self.figures["fired"] += self.control[control.FIRED] - fired
        return problem or self.is_well()

    def is_well(self):
        try:
            self.polites[-1].say()
            with self.service.connect(PATIENCE) as fresh:
                fresh.call(wire.STATUS)
        except (wire.WireError, wire.Refused, OSError) as problem:
            if self.service.ends_within(2):
                return self.death()
            self.service.kill()  # the next trial begins anew
            return f"the other client isn't served: {problem}"
        return None

    def death(self):
        self.figures["deaths"] += 1
        lines = self.service.log_text().strip().splitlines()
        return f"the service died with {self.service.process.returncode}: {lines[-1][-200:] if lines else 'no line'}"

    def account(self):
        """The polite client that is connected now must find all it said."""
        if not self.service.is_running():
            return
        polite = self.polites[-1]
        settled(polite.client)
        status = self.service.stop()
        if status != 0:
            self.context.fail(f"status {status} at the end")
        reader = self.service.reader()
        rows = [(client, number) for _, client, number in rows_after(reader, 0)]
        reader.close()
        verdict = judge(rows, [polite])
        for name, keys in (("lost", verdict.late_lost), ("doubled", verdict.doubled)):
            self.figures[name] += len(keys)
            if keys:
                self.context.fail(f"the other client's messages: {name} {len(keys)}, the first {keys[:3]}")


def run(context, figures):
    figures.update(scenarios=len(SCENARIOS), tried=0, of=0, fired=0, survived=0, deaths=0, lost=0, doubled=0)
    trials = Trials(context, figures)
    ordinals = []
    for scenario in SCENARIOS:
        ordinals += [(scenario, ordinal) for ordinal in range(1, trials.count(scenario) + MARGIN + 1)]
    figures["of"] = len(ordinals)
    context.random.shuffle(ordinals)
    for scenario, ordinal in ordinals:
        if context.left() <= 0:
            break
        problem = trials.one(scenario, ordinal)
        figures["tried"] += 1
        if problem:
            context.fail(f"allocation {ordinal} of {scenario.__name__}: {problem}")
        else:
            figures["survived"] += 1
    trials.account()
