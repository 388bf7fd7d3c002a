# SPDX-License-Identifier: Apache-2.0
"""SIGKILL at random moments while several clients send: what was committed stays, and nothing comes twice."""

import time

from account import Sender, Watcher, judge, rows_after
from service import settled

# Each start reads the store through, so a large one costs kills.
ROUNDS_A_STORE = 5


def no_figures():
    return dict(kills=0, answered=0, rows=0, committed_lost=0, settled_lost=0, late_lost=0, doubled=0,
                lost_within_200ms=0, oldest_lost_ms=0.0, restarts_refused=0)


def run(context, figures):
    figures.update(no_figures())
    while context.left() > 0:
        service = context.new_service()
        key, row = 1, 0
        for _ in range(ROUNDS_A_STORE):
            if context.left() <= 0:
                break
            clients = context.random.randint(1, 6)
            row = one_kill(context, figures, service, range(key, key + clients), row)
            key += clients
            if row is None:
                break
        service.kill()


def one_kill(context, figures, service, keys, row):
    """Loads, kills, starts again and looks; the store's last row then, None when the service doesn't start again."""
    if not service.is_running() and not service.start():
        context.fail(f"the first start ended with {service.process.returncode}: {service.log_text()[-500:]}")
        return None
    senders = [Sender(service.socket, key, window=context.random.choice((64, 512, 2048))) for key in keys]
    watcher = Watcher(service, row)
    for thread in (watcher, *senders):
        thread.start()
    time.sleep(context.random.uniform(0.02, 0.5))
    ended = time.monotonic()
    service.kill()
    for thread in (*senders, watcher):
        thread.stopping.set()
        thread.join()
    figures["kills"] += 1
    if not service.start():
        figures["restarts_refused"] += 1
        context.fail(f"no start after kill {figures['kills']}: {service.log_text()[-500:]}")
        return None
    return look(context, figures, service, (senders, watcher, ended), row)


def look(context, figures, service, load, row, patience=0.2):
    senders, watcher, ended = load
    with service.connect() as client:
        settled(client)
    reader = service.reader()
    rows = rows_after(reader, row)
    verdict = judge([(client, number) for _, client, number in rows], senders, watcher.seen, ended, patience)
    reader.close()
    figures["answered"] += verdict.answered
    figures["rows"] += verdict.rows
    for name in ("committed_lost", "settled_lost", "late_lost", "doubled"):
        keys = getattr(verdict, name)
        figures[name] += len(keys)
        if keys and not (name == "late_lost" and context.brief):
            context.fail(f"kill {figures['kills']}: {name} {len(keys)}, the first {keys[:3]}")
    figures["lost_within_200ms"] += verdict.lost - len(verdict.late_lost)
    figures["oldest_lost_ms"] = max(figures["oldest_lost_ms"], verdict.oldest_lost_ms)
    if verdict.invented:
        context.fail(f"kill {figures['kills']}: rows that nobody sent: {verdict.invented[:3]}")
    return rows[-1][0] if rows else row
