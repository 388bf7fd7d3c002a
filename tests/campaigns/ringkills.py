# SPDX-License-Identifier: Apache-2.0
"""SIGKILL at random moments to programs that post to rings: each message that a ring's header calls posted is recorded,
once, and each that it calls dropped is in the ledger."""

import time

import wire
from rings import DROPPED, POSTED, Poster, doubled, eventually, missing, numbers_after
from service import settled


def run(context, figures):
    figures.update(kills=0, posted=0, recorded=0, dropped=0, lost=0, doubled=0, invented=0, ledger_off=0)
    service = context.new_service()
    if not service.start():
        context.fail(f"the service ended with {service.process.returncode}: {service.log_text()[-500:]}")
        return
    key, row = 1, 0
    while context.left() > 0 and not context.failures:
        rings = context.random.randint(1, 4)
        row = one_kill(context, figures, service, (key, rings), row)
        key += rings
    service.kill()


def one_kill(context, figures, service, keys, row):
    poster = Poster(context, service, *keys)
    poster.hold_rings()
    with service.connect() as client:
        # A ring that the service never saw is gone with its owner.
        context_open = eventually(lambda: client.call(wire.STATUS)["rings_open"] == len(poster.keys))
        time.sleep(context.random.uniform(0, 0.1))
        poster.kill()
        figures["kills"] += 1
        if not context_open or not eventually(lambda: client.call(wire.STATUS)["rings_open"] == 0):
            context.fail(f"kill {figures['kills']}: {client.call(wire.STATUS)['rings_open']} rings are open")
            return row
        settled(client)
        figures["dropped"] += sum(poster.numbers(DROPPED))
        ledger = client.call(wire.STATUS)["messages_dropped_by_client"]
    if ledger != figures["dropped"]:
        figures["ledger_off"] += 1
        context.fail(f"kill {figures['kills']}: {figures['dropped']} messages were dropped, the ledger says {ledger}")
    found, row = numbers_after(service, row)
    for ring, posted in zip(poster.keys, poster.numbers(POSTED)):
        judge(context, figures, found.get(ring, {}), posted)
    return row


def judge(context, figures, numbers, posted):
    """`posted`: as the header says; one more may be there that was published and not counted."""
    lost, twice = missing(numbers, posted), doubled(numbers) if numbers else []
    figures["posted"] += posted
    figures["recorded"] += len(numbers)
    figures["lost"] += len(lost)
    figures["doubled"] += len(twice)
    if lost or twice:
        context.fail(f"kill {figures['kills']}: of {posted} posted {len(lost)} are lost, the first {lost[:3]}; "
                     f"{len(twice)} are there twice, the first {twice[:3]}")
    if len(numbers) > posted + 1:
        figures["invented"] += 1
        context.fail(f"kill {figures['kills']}: {posted} were posted, {len(numbers)} are recorded")
