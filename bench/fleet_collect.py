# SPDX-License-Identifier: Apache-2.0
"""How many rows a second tarnreporting-collect writes, one of them and two side by side, from a stream that is full.

    COLLECT=build/bin/tarnreporting-collect PRODUCER=build/tests/fleet_producer python3 bench/fleet_collect.py

Server, database and collectors share this machine, and the database syncs as it does by default. A line of JSON for
each number of collectors; `rows` are events, and the account must come out even.
"""

import argparse
import json
import os
import resource
import shutil
import subprocess
import sys
import tempfile
import time

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
sys.path[:0] = [os.path.join(ROOT, "tests", "fleet"), os.path.join(ROOT, "tests", "fleet", "collect")]
import nats  # noqa: E402
import postgres  # noqa: E402


def rate(options, collectors, folder):
    database, server = postgres.Database(folder, safe=True), nats.Server(folder)
    try:
        database.start()
        server.start()
        line = measure(options, collectors, database, server, folder)
    finally:
        server.end()
        before = resource.getrusage(resource.RUSAGE_CHILDREN)
        database.end()  # and with it all that the server and its processes used
        after = resource.getrusage(resource.RUSAGE_CHILDREN)
    used = after.ru_utime + after.ru_stime - before.ru_utime - before.ru_stime
    return {**line, "database_us_a_row": round(used * 1e6 / line["rows"], 2)}


def measure(options, collectors, database, server, folder):
    configuration = os.path.join(folder, "collect.toml")
    with open(configuration, "w", encoding="utf-8") as file:
        file.write(f"[server]\nurls = \"{server.url}\"\n[database]\nurl = \"{database.url}\"\n"
                   f"group_messages = {options.group}\n")
    with nats.Client(server.port) as client:
        client.make_stream()
    truth = json.loads(subprocess.run(
        [os.environ["PRODUCER"], "--url", server.url, "--devices", str(options.devices), "--ids", str(options.ids),
         "--batch", str(options.batch), "--seed", str(options.seed)], check=True, stdout=subprocess.PIPE).stdout)
    command = [os.environ["COLLECT"], "--config", configuration]
    subprocess.run([*command, "--migrate"], check=True, stderr=subprocess.DEVNULL)
    begun = time.monotonic()
    running = [subprocess.Popen([*command, "--once"]) for _ in range(collectors)]
    used = 0.0
    for each in running:
        _, status, usage = os.wait4(each.pid, 0)
        if status != 0:
            raise RuntimeError(f"a collector ended with {status}")
        used += usage.ru_utime + usage.ru_stime
    seconds = time.monotonic() - begun - 1  # the last look, which found nothing
    missing, records = map(int, database.ask("SELECT sum(missing + untold), sum(records) FROM account")[0])
    if missing or records != truth["events"]:
        raise RuntimeError(f"{missing} missing, {records} stored of {truth['events']}")
    size = database.number("SELECT sum(pg_total_relation_size(inhrelid)) FROM pg_inherits WHERE inhparent = "
                           "'events'::regclass")
    return {"collectors": collectors, "rows": records, "seconds": round(seconds, 2),
            "rows_a_second": round(records / seconds), "collector_us_a_row": round(used * 1e6 / records, 2),
            "bytes_a_row": round(size / records), "seed": options.seed}


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--devices", type=int, default=200)
    parser.add_argument("--ids", type=int, default=5000)
    parser.add_argument("--batch", type=int, default=500)
    parser.add_argument("--group", type=int, default=64)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--collectors", type=int, nargs="+", default=[1, 2])
    options = parser.parse_args()
    for collectors in options.collectors:
        folder = tempfile.mkdtemp(prefix="tarnrates")
        try:
            print(json.dumps(rate(options, collectors, folder)), flush=True)
        finally:
            shutil.rmtree(folder, True)


if __name__ == "__main__":
    main()
