# SPDX-License-Identifier: Apache-2.0
"""Many devices export to three servers that keep one stream, each behind a proxy that refuses three of ten messages,
loses one of ten acknowledgements and hands others over in another order, and two collectors carry it into a database.
Servers, collectors and exporters are killed meanwhile. What the database has at the end is what was recorded: every
record of every device, with its own content, once, and the sums by hour are theirs; what the stream lost though it had
acknowledged it is asked for again. 250 seconds make a million records.
"""

import json
import os
import signal
import sys
import time

FLEET = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "fleet")
sys.path[:0] = [FLEET, os.path.join(FLEET, "collect")]
import batches  # noqa: E402
import nats  # noqa: E402
import postgres  # noqa: E402
from cluster import Cluster  # noqa: E402
from collectors import Collectors  # noqa: E402
from exporting import Device, eventually  # noqa: E402
from proxy import Proxy  # noqa: E402
from trouble import Killings  # noqa: E402

REFUSED, LOST, REORDERED = 0.3, 0.1, 0.1
LEAST_DEVICES, MOST_DEVICES, DEVICES_A_SECOND = 10, 200, 2.5
RECORDS_A_SECOND = 4000
MOST_AT_ONCE = 100  # records that a device gets at a time
COLLECTORS = 2
SECONDS_BETWEEN_KILLS = (3, 3, 1)  # of servers, collectors, exporters
TICK = 0.02
PATIENCE = 180


def run(context, figures):
    programs = os.path.dirname(context.service_program)
    lacking = postgres.lacking() or ("" if nats.PROGRAM else "nats-server is not installed here")
    if lacking or not os.path.exists(os.path.join(programs, "tarnreporting-collect")):
        context.fail(lacking or "it needs tarnreporting-collect and tarnreporting-export")
        return
    fleet = Fleet(context, figures, programs)
    try:
        fleet.start()
        fleet.play()
        fleet.drain()
        fleet.judge()
    finally:
        fleet.end()


class Fleet:
    def __init__(self, context, figures, programs):
        self.context, self.figures = context, figures
        self.database = postgres.Database(context.folder)
        self.cluster = Cluster(context.new_folder())
        self.proxies = [Proxy(server.port, f"{context.seed} {number}", REFUSED, LOST, REORDERED)
                        for number, server in enumerate(self.cluster.servers)]
        self.collectors = Collectors(os.path.join(programs, "tarnreporting-collect"), context.new_folder(),
                                     self.cluster.urls, self.database.url)
        urls = ",".join(f"nats://127.0.0.1:{proxy.port}" for proxy in self.proxies)
        self.devices = []
        for number in range(min(MOST_DEVICES, max(LEAST_DEVICES, int(context.seconds * DEVICES_A_SECOND)))):
            device = Device(os.path.join(programs, "tarnreporting-export"),
                            os.path.join(context.new_folder(), "device"), f"machine{number}", number)
            device.configure(f"urls = \"{urls}\"\nanswer_seconds = 1\nlongest_pause_seconds = 5")
            self.devices.append(device)

    def start(self):
        self.database.start()
        self.cluster.start()
        self.collectors.migrate()
        for _ in range(COLLECTORS):
            self.collectors.start()
        for device in self.devices:
            device.start()
        self.context.begun = time.monotonic()  # by now all work

    def end(self):
        for device in self.devices:
            device.close()
        self.collectors.end(signal.SIGKILL)
        for proxy in self.proxies:
            proxy.close()
        self.cluster.end()
        self.database.end()

    def play(self):
        context, recorded = self.context, 0
        # Each at least once, however short it is.
        seconds = [min(each, context.seconds / 2) for each in SECONDS_BETWEEN_KILLS]
        killings = Killings(self.cluster, self.collectors, self.devices, seconds, context.seed)
        while recorded < context.seconds * RECORDS_A_SECOND:
            while recorded < min(context.seconds, context.seconds - context.left()) * RECORDS_A_SECOND:
                count = context.random.randint(1, MOST_AT_ONCE)
                context.random.choice(self.devices).record(count)
                recorded += count
            time.sleep(TICK)
        counts = killings.end()
        if not all(counts.values()):
            context.fail(f"not all were killed: {counts}")
        self.figures.update(devices=len(self.devices), records=recorded, **counts)

    def drain(self):
        """Under the same faults, but for the kills."""
        begun = time.monotonic()
        behind = self.devices
        while behind and time.monotonic() - begun < PATIENCE:
            time.sleep(0.1)
            behind = [device for device in behind if device.cursor() < device.last]
        for device in behind:
            self.context.fail(f"{device.folder}: up to {device.cursor()} of {device.last} after {PATIENCE} s: "
                              + " / ".join(device.logged().splitlines()[-2:]))
        self.figures["devices_s"] = time.monotonic() - begun
        # A killed server may lose what it had acknowledged; what the database misses it asks the devices for.
        if not eventually(self.is_stored, PATIENCE):
            self.context.fail("not all was stored: " + " / ".join(self.collectors.logged().splitlines()[-3:]))
        for name in ("published", "refused", "lost", "reordered"):
            self.figures[name] = sum(proxy.counts[name] for proxy in self.proxies)
            if not self.figures[name]:
                self.context.fail(f"no message was {name}")
        self.figures["messages"] = self.cluster.of_stream()["state"]["messages"]
        self.figures["asked_again"] = self.collectors.asked_again()
        self.figures["drain_s"] = time.monotonic() - begun

    def is_stored(self):
        made = sum(device.last for device in self.devices)
        return self.database.ask("SELECT sum(made), sum(records), sum(untold) FROM account_by_counts") == [
            [str(made), str(made), "0"]]

    def in_stream(self):
        """By device's number the ids that the stream has, read without the programs' code."""
        found = {}
        messages = self.cluster.use(lambda client: client.all_messages())
        for _, message in messages:
            batch = batches.read(message)
            for each, payload in batch.events.items():
                found.setdefault(json.loads(payload)["session_duration"], set()).add(each)
        return found

    def judge(self):
        """Against what was recorded: a record's payload says which device's it is, and which."""
        found = {int(number): list(map(int, row)) for number, *row in self.database.ask("""
            SELECT payload ->> 'session_duration', count(DISTINCT device), count(*), count(DISTINCT id), min(id),
              max(id), count(*) FILTER (WHERE (payload ->> 'play_seconds')::bigint = id) FROM events GROUP BY 1""")}
        exported = self.in_stream()
        stored = sum(row[1] for row in found.values())
        distinct = sum(row[2] for row in found.values())
        recorded = sum(device.last for device in self.devices)
        self.figures.update(exported=sum(map(len, exported.values())), stored=stored, missing=recorded - distinct,
                            double=stored - distinct)
        must = {device.number: [1, *[device.last] * 2, 1, *[device.last] * 2] for device in self.devices if device.last}
        for number in must.keys() | found.keys():
            if must.get(number) != found.get(number):
                self.context.fail(f"device {number}: names, records, ids, first, last, right ones are "
                                  f"{found.get(number)}, and must be {must.get(number)}; the stream has "
                                  f"{len(exported.get(number, ()))} records of it")
        account = [int(each) for each in self.database.ask(
            "SELECT sum(made), sum(stored), sum(gaps), sum(left_out), sum(missing), sum(untold) FROM account")[0]]
        if account != [recorded, recorded, 0, 0, 0, 0]:
            self.context.fail(f"{recorded} recorded; the account says {account}")
        seconds = sum(device.last * (device.last + 1) // 2 for device in self.devices)
        if (told := self.database.number("SELECT sum(play_seconds) FROM hours")) != seconds:
            self.context.fail(f"{seconds} seconds were played; by hour it is {told}")
