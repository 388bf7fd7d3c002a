# SPDX-License-Identifier: Apache-2.0
"""The configuration is read anew while clients send, a tenth of the times from a broken file: no client notices, what
was answered is there, once, and the generation counts the good ones.
"""

import os
import signal
import time

import wire
from account import Sender, judge, rows_after
from context import NOTHING_EXPIRES
from service import PATIENCE, settled

BROKEN = ("[limits]\nsessions_per_user = 0\n", "[limits\n", "[limit]\n", "sessions_per_user = 1\n",
          "[tally]\nin_use = 7\n", "\x00\n", "[recorder]\nmax_age_days = \"3\"\n")
SHARE_BROKEN = 0.1
# Reloads of one run of the senders.
RELOADS = 50


def run(context, figures):
    figures.update(reloads=0, broken=0, coalesced=0, answered=0, rows=0, lost=0, doubled=0, slowest_ms=0.0)
    service = context.new_service()
    if not service.start():
        context.fail(f"the start ended with {service.process.returncode}: {service.log_text()[-500:]}")
        return
    account = {"good": 0, "bad": 0, "row": 0, "key": 1}
    asker = service.connect()
    while context.left() > 0 and not context.failures:
        one_load(context, figures, service, asker, account)
    asker.close()
    status = service.stop()
    if status != 0:
        context.fail(f"status {status} at the end: {service.log_text()[-500:]}")


def one_load(context, figures, service, asker, account):
    """Reloads one after another, and some in a burst, while senders send."""
    clients = context.random.randint(1, 4)
    senders = [Sender(service.socket, account["key"] + n, window=context.random.choice((64, 512)))
               for n in range(clients)]
    account["key"] += clients
    for sender in senders:
        sender.start()
    for _ in range(RELOADS):
        if context.left() <= 0 or context.failures:
            break
        one_reload(context, figures, service, asker, account)
    for sender in senders:
        sender.stopping.set()
        sender.join()
        if sender.problem is not None or sender.refused:
            context.fail(f"client {sender.key}: {sender.problem!r}, {len(sender.refused)} requests refused")
    settled(asker)
    look(context, figures, service, senders, account)


def text_of(context):
    """A configuration of which much is another one than before, and nothing keeps a client from sending."""
    pick = context.random.choice
    return (NOTHING_EXPIRES + f"max_age_days = {pick((1, 30, 365))}\n"
            f"[limits]\nsessions_per_user = {pick((100, 1000, 5000))}\nlog_bytes = {pick((65536, 1 << 24, 1 << 28))}\n"
            f"log_bytes_per_session = {pick((65536, 1 << 26))}\nmax_frame_bytes = {pick((65536, 1 << 20))}\n"
            f"half_frame_ms = {pick((1000, 30000))}\n[rtc]\navailable = {pick(('true', 'false'))}\n"
            f"[snare]\nrefuse = \"{pick(('', 'DailyLimitExceeded'))}\"\n"
            f"[log]\nlevel = \"{pick(('debug', 'error'))}\"\n")


def one_reload(context, figures, service, asker, account):
    broken = context.random.random() < SHARE_BROKEN
    burst = 1 if context.random.random() < 0.8 else context.random.randint(2, 5)
    before = asker.call(wire.STATUS)
    with open(service.configuration + ".new", "w", encoding="utf-8") as file:
        file.write(context.random.choice(BROKEN) if broken else text_of(context))
    os.replace(service.configuration + ".new", service.configuration)
    begun = time.monotonic()
    for _ in range(burst):
        service.process.send_signal(signal.SIGHUP)
    after = looked_at(asker, before, broken, burst)
    if after is None:
        context.fail(f"reload {figures['reloads'] + 1} isn't over within {PATIENCE} s")
        return
    figures["slowest_ms"] = max(figures["slowest_ms"], (time.monotonic() - begun) * 1000)
    good = after["configuration_generation"] - before["configuration_generation"]
    bad = after["configuration_reloads_refused"] - before["configuration_reloads_refused"]
    figures["reloads"] += good + bad
    figures["broken"] += bad
    figures["coalesced"] += burst - good - bad
    if (good if broken else bad) != 0 or good + bad > burst:
        context.fail(f"a {'broken' if broken else 'good'} file, {burst} signals: {good} good and {bad} bad reloads")
    if bool(after["configuration_fault"]) != broken:
        context.fail(f"a {'broken' if broken else 'good'} file, and status tells {after['configuration_fault']!r}")


def looked_at(asker, before, broken, burst):
    """The status once as many reloads are over as there can be, or no more come; None when none is in time."""
    name = "configuration_reloads_refused" if broken else "configuration_generation"
    deadline = time.monotonic() + PATIENCE
    while time.monotonic() < deadline:
        now = asker.call(wire.STATUS)
        if now[name] - before[name] >= 1:
            # A signal that was still waiting is seen by the look that brought this answer, and served before the next.
            return now if burst == 1 else asker.call(wire.STATUS)
        time.sleep(0.0005)
    return None


def look(context, figures, service, senders, account):
    reader = service.reader()
    rows = rows_after(reader, account["row"])
    reader.close()
    verdict = judge([(client, number) for _, client, number in rows], senders)
    figures["answered"] += verdict.answered
    figures["rows"] += verdict.rows
    for name, keys in (("lost", verdict.late_lost), ("doubled", verdict.doubled)):
        figures[name] += len(keys)
        if keys:
            context.fail(f"{name} {len(keys)} under reloads, the first {keys[:3]}")
    if verdict.invented:
        context.fail(f"rows that nobody sent: {verdict.invented[:3]}")
    account["row"] = rows[-1][0] if rows else account["row"]
