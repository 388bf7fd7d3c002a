# SPDX-License-Identifier: Apache-2.0
"""The wall clock steps by a day, a year, a decade, forward and back, while the service runs and while it doesn't, and
begins in 1970 now and then. Hardly any time truly passes, so no row has grown old: none may go.
"""

import time

import control
import wire
from account import FIRST, begin_session, message, rows_after
from service import settled

KEY = 1
DAY = 86400
STEPS = (DAY, -DAY, 31 * DAY, -31 * DAY, 366 * DAY, -366 * DAY, 3660 * DAY, -3660 * DAY)
MESSAGES = 40
# After a step the clock tells a time of these years.
EARLIEST, LATEST = 0, 4102444800


class Trials:
    def __init__(self, context, figures):
        self.context, self.figures = context, figures
        self.control = context.new_control()
        # With an age that every larger step exceeds.
        configuration = "[recorder]\nmax_age_days = 30\n"
        self.service = context.new_service(configuration, environment=self.control.environment(context.shim("clock")))
        self.next = FIRST

    def set_offset(self, seconds):
        now = time.time()
        seconds = min(max(seconds, EARLIEST - now), LATEST - now)
        self.control[control.CLOCK_OFFSET] = int(seconds * 1e9)
        return seconds

    def start(self):
        if not self.service.start():
            raise RuntimeError(f"the service doesn't start: {self.service.log_text()[-500:]}")

    def say(self):
        """Some messages, and then what retention does when it writes is done."""
        with self.service.connect() as client:
            begin_session(client, KEY)
            for number in range(self.next, self.next + MESSAGES):
                client.call(wire.SEND, message(KEY, number), wire.PLAYBACK, wire.PLAYBACK_START, [KEY])
            self.next += MESSAGES
            settled(client)

    def look(self, what):
        reader = self.service.reader()
        there = {number for _, _, number in rows_after(reader, 0)}
        reader.close()
        missing = [number for number in range(FIRST, self.next) if number not in there]
        self.figures["deleted"] += len(missing)
        if missing:
            self.context.fail(f"{what}: {len(missing)} of {self.next - FIRST} rows are gone")
        return not missing


def one_round(trials):
    """Some steps over one store; whether all rows are still there."""
    random = trials.context.random
    offset = trials.set_offset(-time.time() if random.random() < 0.3 else 0)
    trials.start()
    trials.say()
    whole = True
    for _ in range(random.randint(2, 5)):
        step = random.choice(STEPS)
        restarts = random.random() < 0.4
        if restarts and trials.service.stop() != 0:
            trials.context.fail("the service doesn't end well")
        offset = trials.set_offset(offset + step)
        if restarts:
            trials.start()
        trials.say()
        trials.say()
        trials.figures["steps"] += 1
        whole = trials.look(f"after a step of {step // DAY} days{', across a restart' if restarts else ''}")
        if not whole:
            break
    trials.service.kill()
    return whole


def run(context, figures):
    figures.update(rounds=0, steps=0, rows=0, deleted=0)
    while context.left() > 0:
        trials = Trials(context, figures)
        one_round(trials)
        figures["rounds"] += 1
        figures["rows"] += trials.next - FIRST
