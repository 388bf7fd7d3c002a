# SPDX-License-Identifier: Apache-2.0
"""The service is killed or ended and started again while programs post to rings: no call of theirs ever fails, a close
leaves nothing, what was posted is there, once, but for what a kill may cost."""

import signal
import time

from account import FIRST
from rings import POSTED, TAKEN_MESSAGES, Poster, doubled, eventually, missing, numbers_after
from service import settled
import wire

ENDS_A_STORE = 8


def run(context, figures):
    figures.update(ends=0, posted=0, recorded=0, lost_by_kills=0, lost=0, doubled=0, odd_posters=0)
    while context.left() > 0 and not context.failures:
        one_store(context, figures)


def one_store(context, figures):
    service = context.new_service()
    if not service.start():
        context.fail(f"no first start: {service.log_text()[-500:]}")
        return
    posters = [Poster(context, service, 1, 2), Poster(context, service, 11, 1)]
    for poster in posters:
        poster.hold_rings()
    kills = context.random.random() < 0.5
    for _ in range(ENDS_A_STORE):
        time.sleep(context.random.uniform(0.02, 0.3))
        end(context, figures, service, kills)
        if context.failures or context.left() <= 0:
            break
    if not context.failures:
        look(context, figures, service, posters, kills)
    for poster in posters:
        poster.kill()
    service.kill()


def end(context, figures, service, kills):
    figures["ends"] += 1
    if kills:
        service.kill()
    elif service.stop(signal.SIGTERM) != 0:
        context.fail(f"end {figures['ends']}: status {service.process.returncode}: {service.log_text()[-500:]}")
        return
    time.sleep(context.random.choice((0, 0, 0.1)))
    if not service.start():
        context.fail(f"no start after end {figures['ends']}: {service.log_text()[-500:]}")


def state_of(service):
    """What the service says of itself that may tell why a program's end wasn't served."""
    with service.connect() as client:
        status = client.call(wire.STATUS)
    told = ("rings", "ring_", "requests_", "messages_", "sessions", "connections_", "replies_", "recorder_waiting",
            "queue", "out_of_memory")
    return "the service: " + ", ".join(f"{name} {value}" for name, value in sorted(status.items())
                                       if name.startswith(told))


def look(context, figures, service, posters, kills):
    for poster in posters:
        status, complaints = poster.end()
        if status != 0:
            figures["odd_posters"] += 1
            context.fail(f"a program that posts ended with {status} after {figures['ends']} ends, the last ones "
                         f"{'kills' if kills else 'stops'}: {complaints[-300:]}; {state_of(service)}")
    with service.connect() as client:
        if not eventually(lambda: client.call(wire.STATUS)["rings_open"] == 0):
            context.fail("the rings of programs that ended stay open")
        settled(client)
    found, _ = numbers_after(service, 0)
    for poster in posters:
        for key, posted, taken in zip(poster.keys, poster.numbers(POSTED), poster.numbers(TAKEN_MESSAGES)):
            numbers = found.get(key, {})
            lost, twice = missing(numbers, posted), doubled(numbers) if numbers else []
            figures["posted"] += posted
            figures["recorded"] += len(numbers)
            figures["lost_by_kills" if kills else "lost"] += len(lost)
            figures["doubled"] += len(twice)
            if taken != posted:
                context.fail(f"ring {key}: {posted} were posted, {taken} taken")
            if twice or (lost and not kills):
                context.fail(f"ring {key}, {'kills' if kills else 'ends'}: {len(lost)} lost, the first {lost[:3]}; "
                             f"{len(twice)} twice, the first {twice[:3]}; of {posted} from {FIRST} on")
