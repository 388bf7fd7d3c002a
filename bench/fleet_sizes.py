# SPDX-License-Identifier: Apache-2.0
"""What a record weighs on its way from a device to the database, and how much a program and a server carry.

    python3 -B bench/fleet_sizes.py --programs build/bin

The records are those of a real service to which every script of examples/ was played, over and over again, with the
lists of an export.toml that says nothing else. Three servers keep the stream; all share this machine. A line of JSON
for each step.
"""

import argparse
import glob
import json
import os
import resource
import selectors
import shutil
import socket
import sqlite3
import subprocess
import sys
import tempfile
import time

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
sys.path[:0] = [os.path.join(ROOT, "tests", *words) for words in (("fleet",), ("fleet", "collect"), ("campaigns",))]
import batches  # noqa: E402
import postgres  # noqa: E402
from cluster import Cluster  # noqa: E402
from collectors import Collectors  # noqa: E402
from exporting import Device, eventually  # noqa: E402
from service import Service  # noqa: E402

GREETING = b'CONNECT {"verbose":false,"headers":true}\r\nSUB _INBOX.fleet.* 1\r\nPING\r\n'
WINDOW = 16  # messages that a connection has on their way


class Played(Device):
    """A store that is filled with what a real service recorded."""

    def fill(self, events, count):
        ids = range(self.last + 1, self.last + count + 1)
        rows = [events[(each - 1) % len(events)] for each in ids]
        with self.store:
            self.store.executemany("INSERT INTO event_texts VALUES(?, NULL, NULL, ?)",
                                   [(2 * each, row[2]) for each, row in zip(ids, rows)])
            self.store.executemany("INSERT INTO event_texts VALUES(?, ?, ?, ?)",
                                   [(2 * each + 1, row[0], row[1], row[3]) for each, row in zip(ids, rows)])
            self.store.executemany("INSERT INTO event_rows VALUES(?, ?, 0, 0, NULL, 1)",
                                   [(each, 1795158000 + each) for each in ids])
        self.last += count


def tell(**figures):
    print(json.dumps({key: round(value, 2) if isinstance(value, float) else value for key, value in figures.items()}),
          flush=True)


def play(options, folder):
    """What the scripts leave in a store: (backend, name, payload, detail) in order of id."""
    service = Service(os.path.join(options.programs, "tarnreportingd"), os.path.join(folder, "played"))
    if not service.start():
        raise RuntimeError(service.log_text())
    for script in sorted(glob.glob(os.path.join(ROOT, "examples", "*.jsonl"))):
        if not script.endswith(".expected.jsonl"):
            subprocess.run([os.path.join(options.programs, "tarnreportingctl"), "--socket", service.socket, "run",
                            script], check=True, stdout=subprocess.DEVNULL)
    service.stop()
    with sqlite3.connect(service.store) as store:
        events = store.execute("SELECT backend, name, payload, detail FROM events ORDER BY id").fetchall()
        [sessions] = store.execute("SELECT count(*) FROM sessions").fetchone()
    store.close()
    return events, sessions


def used_by(command):
    """Seconds of the clock and of the processors that a program takes until it ends."""
    begun, before = time.monotonic(), resource.getrusage(resource.RUSAGE_CHILDREN)
    subprocess.run(command, check=True, stderr=subprocess.DEVNULL)
    after = resource.getrusage(resource.RUSAGE_CHILDREN)
    return time.monotonic() - begun, after.ru_utime + after.ru_stime - before.ru_utime - before.ru_stime


def in_stream(cluster):
    """Messages, their records and bytes, and the bytes of the files of one of the servers."""
    with cluster.servers[0].client(30) as client:
        messages = [message for _, message in client.all_messages()]
    folder = os.path.dirname(cluster.servers[0].configuration)
    files = sum(os.path.getsize(os.path.join(path, name)) for path, _, names in os.walk(os.path.join(
        folder, "jetstream")) for name in names if name.endswith(".blk") and "TARNREPORTING" in path)
    return len(messages), sum(len(batches.read(each).events) for each in messages), sum(map(len, messages)), files


def export(options, folder, cluster, events, sessions):
    """A device that begins with much to tell; then one that tells a session at a time."""
    program = os.path.join(options.programs, "tarnreporting-export")
    much = Played(program, os.path.join(folder, "much"), "much")
    few = Played(program, os.path.join(folder, "few"), "few", 1)
    try:
        for device in (much, few):
            device.configure(f"urls = \"{cluster.urls}\"")
        much.fill(events, options.ids)
        seconds, used = used_by(much.command("--once"))
        messages, records, size, files = in_stream(cluster)
        # No bytes here: what comes again and again in one message takes no room.
        tell(step="all at once", ids=options.ids, records=records, messages=messages,
             ids_a_second=round(options.ids / seconds), exporter_us_an_id=used * 1e6 / options.ids)
        few.start()
        for _ in range(options.sessions):
            few.fill(events, len(events) // sessions)
            if not eventually(lambda: few.cursor() == few.last):
                raise RuntimeError(few.logged())
        after = in_stream(cluster)
        tell(step="a session at a time", sessions=options.sessions, records=after[1] - records,
             messages=after[0] - messages, records_a_session=(after[1] - records) / options.sessions,
             bytes_a_record=(after[2] - size) / (after[1] - records),
             bytes_a_message=(after[2] - size) / (after[0] - messages),
             server_bytes_beyond_a_message=(after[3] - files - after[2] + size) / (after[0] - messages))
    finally:
        much.close()
        few.close()


def collect(options, folder, cluster, database):
    collector = Collectors(os.path.join(options.programs, "tarnreporting-collect"), folder, cluster.urls, database.url)
    collector.migrate()
    seconds, used = used_by([*collector.command, "--once"])
    rows = int(database.number("SELECT count(*) FROM events"))
    of_events = "FROM pg_inherits WHERE inhparent = 'events'::regclass"
    tell(step="collected", rows=rows, rows_a_second=round(rows / (seconds - 1)),  # the last look found nothing
         collector_us_a_row=used * 1e6 / rows,
         bytes_a_row=database.number(f"SELECT sum(pg_total_relation_size(inhrelid)) {of_events}") / rows,
         of_it_indexes=database.number(f"SELECT sum(pg_indexes_size(inhrelid)) {of_events}") / rows)


def memory(server):
    with open(f"/proc/{server.process.pid}/status", encoding="ascii") as file:
        return next(int(line.split()[1]) * 1024 for line in file if line.startswith("VmRSS"))


def connected(port):
    made = socket.create_connection(("127.0.0.1", port), timeout=10)
    made.sendall(GREETING)
    return made


def connect(options, cluster):
    before = sum(map(memory, cluster.servers))
    held = [connected(cluster.servers[number % 3].port) for number in range(options.connections)]
    time.sleep(2)
    after = sum(map(memory, cluster.servers))
    for each in held:
        each.close()
    tell(step="connected", connections=options.connections, server_bytes_a_connection=(after - before)
         / options.connections)


def publish(options, cluster, size):
    """Acknowledged messages a second of as many connections as keep the servers busy."""
    made = [connected(cluster.servers[number % 3].port) for number in range(options.publishers)]
    ready, number, acknowledged = selectors.DefaultSelector(), 0, 0
    payload = os.urandom(size)

    def send(to, count):
        nonlocal number
        for _ in range(count):
            number += 1
            head = b"NATS/1.0\r\nNats-Msg-Id: rate%d.%d\r\n\r\n" % (size, number)
            to.sendall(b"HPUB tarnreporting.rate _INBOX.fleet.%d %d %d\r\n%s%s\r\n"
                       % (number, len(head), len(head) + size, head, payload))

    for each in made:
        ready.register(each, selectors.EVENT_READ)
        send(each, WINDOW)
    begun = time.monotonic()
    while (seconds := time.monotonic() - begun) < options.seconds:
        for key, _ in ready.select(0.1):
            answers = key.fileobj.recv(65536).count(b"MSG _INBOX.fleet")
            acknowledged += answers
            send(key.fileobj, answers)
    ready.close()
    for each in made:
        each.close()
    tell(step="published", connections=options.publishers, bytes_a_message=size,
         messages_a_second=round(acknowledged / seconds))


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--programs", default="build/bin")
    parser.add_argument("--ids", type=int, default=400_000)
    parser.add_argument("--sessions", type=int, default=100)
    parser.add_argument("--connections", type=int, default=6000)
    parser.add_argument("--publishers", type=int, default=48)
    parser.add_argument("--seconds", type=float, default=10)
    options = parser.parse_args()
    _, most = resource.getrlimit(resource.RLIMIT_NOFILE)
    resource.setrlimit(resource.RLIMIT_NOFILE, (most, most))
    folder = tempfile.mkdtemp(prefix="tarnsizes")
    database, cluster = postgres.Database(folder, safe=True), Cluster(folder)
    try:
        events, sessions = play(options, folder)
        database.start()
        cluster.start()
        export(options, folder, cluster, events, sessions)
        collect(options, folder, cluster, database)
        connect(options, cluster)
        for size in (1000, 10_000):
            publish(options, cluster, size)
    finally:
        cluster.end()
        database.end()
        shutil.rmtree(folder, True)


if __name__ == "__main__":
    main()
