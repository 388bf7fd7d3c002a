# SPDX-License-Identifier: Apache-2.0
"""SIGTERM at random moments while several clients send all they can: all that was answered is there, once, and the end
is clean."""

import time

from account import Sender, judge, rows_after


def run(context, figures):
    figures.update(ends=0, answered=0, rows=0, lost=0, doubled=0, unclean=0, slowest_end_ms=0.0)
    service = context.new_service()
    key, row = 1, 0
    while context.left() > 0:
        clients = context.random.randint(1, 6)
        row = one_end(context, figures, service, range(key, key + clients), row)
        key += clients
        if row is None:
            return


def one_end(context, figures, service, keys, row):
    if not service.start():
        context.fail(f"start {figures['ends'] + 1} ended with {service.process.returncode}: "
                     f"{service.log_text()[-500:]}")
        return None
    senders = [Sender(service.socket, key, window=context.random.choice((64, 512, 2048))) for key in keys]
    for sender in senders:
        sender.start()
    time.sleep(context.random.uniform(0.02, 0.6))
    asked = time.monotonic()
    status = service.stop()
    figures["slowest_end_ms"] = max(figures["slowest_end_ms"], (time.monotonic() - asked) * 1000)
    for sender in senders:
        sender.stopping.set()
        sender.join()
    figures["ends"] += 1
    if status != 0:
        figures["unclean"] += 1
        context.fail(f"end {figures['ends']}: status {status} at the end: {service.log_text()[-500:]}")
    return look(context, figures, service, senders, row)


def look(context, figures, service, senders, row):
    reader = service.reader()
    rows = rows_after(reader, row)
    reader.close()
    verdict = judge([(client, number) for _, client, number in rows], senders)
    figures["answered"] += verdict.answered
    figures["rows"] += verdict.rows
    for name, keys in (("lost", verdict.late_lost), ("doubled", verdict.doubled)):
        figures[name] += len(keys)
        if keys:
            context.fail(f"end {figures['ends']}: {name} {len(keys)}, the first {keys[:3]}")
    if verdict.invented:
        context.fail(f"end {figures['ends']}: rows that nobody sent: {verdict.invented[:3]}")
    return rows[-1][0] if rows else row
