# SPDX-License-Identifier: Apache-2.0
"""Many devices export to one server through a proxy that refuses three of ten messages, loses one of ten
acknowledgements and hands others over in another order, while the server and the exporters are killed. What the stream
holds at the end is read without the exporter's code: every record of every device is there, those that came twice are
the same, and no message is there twice.
"""

import json
import os
import signal
import sys
import time

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "fleet"))
import batches  # noqa: E402
import nats  # noqa: E402
from exporting import Device  # noqa: E402
from proxy import Proxy  # noqa: E402

REFUSED, LOST, REORDERED = 0.3, 0.1, 0.1
LEAST_DEVICES, MOST_DEVICES, DEVICES_A_SECOND = 10, 200, 2.5
TICK = 0.02
MOST_AT_ONCE = 60  # records that a device gets in a tick
SECONDS_BETWEEN_SERVER_KILLS = 2.5
SECONDS_BETWEEN_KILLS = 0.3
PATIENCE = 100


def run(context, figures):
    figures.update(devices=0, records=0, messages=0, published=0, refused=0, lost=0, reordered=0, server_kills=0,
                   exporter_kills=0, again=0, missing=0, double=0, drain_s=0.0)
    program = os.path.join(os.path.dirname(context.service_program), "tarnreporting-export")
    if not nats.PROGRAM or not os.path.exists(program):
        context.fail("it needs nats-server and tarnreporting-export")
        return
    server = nats.Server(context.new_folder())
    proxy = Proxy(server.port, context.seed, REFUSED, LOST, REORDERED)
    devices = []
    try:
        server.start()
        with server.client() as client:
            client.make_stream()
        for number in range(min(MOST_DEVICES, max(LEAST_DEVICES, int(context.seconds * DEVICES_A_SECOND)))):
            devices.append(Device(program, os.path.join(context.new_folder(), "device"), f"machine{number}",
                                  number))
            devices[-1].configure(f"urls = \"nats://127.0.0.1:{proxy.port}\"\nanswer_seconds = 1")
            devices[-1].start()
        play(context, figures, server, devices)
        drain(context, figures, devices)
        figures.update(proxy.counts, devices=len(devices), records=sum(device.last for device in devices))
        judge(context, figures, server, devices)
    finally:
        for device in devices:
            device.close()
        proxy.close()
        server.end()


def play(context, figures, server, devices):
    next_server, next_exporter = (time.monotonic() + each for each in (SECONDS_BETWEEN_SERVER_KILLS,
                                                                       SECONDS_BETWEEN_KILLS))
    while context.left() > 0:
        for device in context.random.sample(devices, len(devices) // 4):
            device.record(context.random.randint(1, MOST_AT_ONCE))
        if time.monotonic() >= next_exporter:
            next_exporter = time.monotonic() + SECONDS_BETWEEN_KILLS * context.random.uniform(0.5, 1.5)
            kill_one(context.random.choice(devices))
            figures["exporter_kills"] += 1
        if time.monotonic() >= next_server:
            server.end()
            figures["server_kills"] += 1
            server.start()
            next_server = time.monotonic() + SECONDS_BETWEEN_SERVER_KILLS * context.random.uniform(0.5, 1.5)
        time.sleep(TICK)


def kill_one(device):
    device.kill()
    device.start()


def drain(context, figures, devices):
    """Under the same faults, but for the kills."""
    begun = time.monotonic()
    behind = devices
    while behind and time.monotonic() - begun < PATIENCE:
        time.sleep(0.05)
        behind = [device for device in behind if device.cursor() < device.last]
    figures["drain_s"] = time.monotonic() - begun
    for device in behind:
        context.fail(f"{device.folder}: up to {device.cursor()} of {device.last} after {PATIENCE} s: "
                     + " / ".join(device.logged().splitlines()[-2:]))
    for device in devices:
        for process in device.processes:
            process.send_signal(signal.SIGTERM)


def judge(context, figures, server, devices):
    """Against what was recorded: which device, which ids, and what each says."""
    found, names = {}, set()  # payloads by id, by device
    with server.client() as client:
        messages = client.all_messages()
    figures["messages"] = len(messages)
    for headers, message in messages:
        one_message(context, figures, headers, message, found, names)
    if len(found) != len(devices):
        context.fail(f"{len(devices)} devices, {len(found)} in the stream")
    # A device's name there is a hash, so its events tell which it is.
    by_number = {json.loads(ids[min(ids)])["session_duration"]: ids for ids in found.values() if ids}
    for device in devices:
        recorded = {each: device.payload(each).encode() for each in range(1, device.last + 1)}
        ids = by_number.get(device.number, {})
        missing = recorded.keys() - ids.keys()
        figures["missing"] += len(missing)
        if ids != recorded:
            wrong = sorted(each for each, payload in ids.items() if recorded.get(each) != payload)
            context.fail(f"device {device.number}: {device.last} recorded, {len(ids)} in the stream; without "
                         f"{sorted(missing)[:5]}, and not as they were recorded {wrong[:5]}")


def one_message(context, figures, headers, message, found, names):
    name = next(line.split(":", 1)[1].strip() for line in headers.splitlines() if line.startswith("Nats-Msg-Id"))
    if name in names:
        figures["double"] += 1
        context.fail(f"message {name} is there twice")
    names.add(name)
    batch = batches.read(message)
    if name.rsplit(".", 1)[0] != f"{batch.device.hex()}.{batch.first}-{batch.last}":
        context.fail(f"message {name} holds {batch.first} to {batch.last} of {batch.device.hex()}")
    if batch.gaps or batch.left_out:
        context.fail(f"message {name} has gaps {batch.gaps} and leaves out {batch.left_out}")
    ids = found.setdefault(batch.device, {})
    for each, payload in batch.events.items():
        if each in ids:
            figures["again"] += 1
            if ids[each] != payload:
                figures["double"] += 1
                context.fail(f"event {each} of {batch.device.hex()} is there with two contents")
        ids[each] = payload
