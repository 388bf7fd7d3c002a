# SPDX-License-Identifier: Apache-2.0
"""The disk stalls: now and then a synchronisation takes half a second longer, and somewhere in that or after it comes
SIGKILL. What came in is bounded by the time that the first of it has waited, so no more than the stall and the usual
200 ms of it may be lost, and clients are slowed down rather than told that their messages are safe.
"""

import time

from account import Sender, Watcher
from control import DELAYS, SYNC_DELAY
from kills import look

STALL = 0.5
PATIENCE = 0.2 + STALL


def run(context, figures):
    figures.update(kills=0, stalls=0, answered=0, rows=0, committed_lost=0, settled_lost=0, late_lost=0, doubled=0,
                   lost_within_200ms=0, oldest_lost_ms=0.0, restarts_refused=0, longest_silence_ms=0.0)
    while context.left() > 0:
        control = context.new_control()
        service = context.new_service(environment=control.environment(context.shim("faults")))
        key, row = 1, 0
        for _ in range(5):
            if context.left() <= 0 or row is None:
                break
            clients = context.random.randint(1, 4)
            row = one_kill(context, figures, (service, control), range(key, key + clients), row)
            key += clients
        figures["stalls"] += control[DELAYS]
        service.kill()


def one_kill(context, figures, subject, keys, row):
    service, control = subject
    if not service.is_running() and not service.start():
        context.fail(f"the first start ended with {service.process.returncode}: {service.log_text()[-500:]}")
        return None
    senders = [Sender(service.socket, key, window=context.random.choice((64, 512, 2048))) for key in keys]
    watcher = Watcher(service, row)
    for thread in (watcher, *senders):
        thread.start()
    for _ in range(context.random.randint(0, 1)):
        time.sleep(context.random.uniform(0.05, 0.3))
        control[SYNC_DELAY] = int(STALL * 1000)
        time.sleep(STALL + 0.3)
    time.sleep(context.random.uniform(0.05, 0.3))
    control[SYNC_DELAY] = int(STALL * 1000)
    time.sleep(context.random.uniform(0, STALL + 0.2))
    ended = time.monotonic()
    service.kill()
    control[SYNC_DELAY] = 0
    for thread in (*senders, watcher):
        thread.stopping.set()
        thread.join()
    figures["kills"] += 1
    figures["longest_silence_ms"] = max([figures["longest_silence_ms"], *map(longest_silence, senders)])
    if not service.start():
        figures["restarts_refused"] += 1
        context.fail(f"no start after kill {figures['kills']}: {service.log_text()[-500:]}")
        return None
    return look(context, figures, service, (senders, watcher, ended), row, PATIENCE)


def longest_silence(sender):
    """Milliseconds between two answers of messages: while the gate is closed nobody is answered."""
    moments = [when for when, numbers in sender.answers if numbers]
    return max((1000 * (after - before) for before, after in zip(moments, moments[1:])), default=0.0)
