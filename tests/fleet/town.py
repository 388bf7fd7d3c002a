#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""A fleet on one machine: real services with their clients and exporters beside simulated devices, three servers that
keep one stream, two collectors and a database. Servers, collectors, exporters and services are killed meanwhile. When
all has come to rest the account is shown: what was made, what the stream has of it, and what the database has.

usage: town.py --programs DIR --producer FILE [--services N] [--devices N] [--seed N] [--keep] [SECONDS]

A simulated device is a name of its own with records of its own; one program makes the messages of all of them, as
exporters do, also some that come twice. The stream is read without a line of the programs' code. The seed is that of
TARN_TEST_SEED, else of --seed, else a fresh one. Exit status 1 when the account doesn't come out even.
"""

import argparse
import glob
import json
import os
import random
import shutil
import signal
import sqlite3
import subprocess
import sys
import tempfile
import time

FOLDER = os.path.dirname(os.path.abspath(__file__))
ROOT = os.path.dirname(os.path.dirname(FOLDER))
sys.path[:0] = [FOLDER, os.path.join(FOLDER, "collect"), os.path.join(ROOT, "tests", "campaigns")]
import batches  # noqa: E402
import nats  # noqa: E402
import postgres  # noqa: E402
from cluster import Cluster  # noqa: E402
from collectors import Collectors, drained  # noqa: E402
from exporting import Exporter  # noqa: E402
from service import Service  # noqa: E402
from trouble import Killings  # noqa: E402

SEED_VARIABLE = "TARN_TEST_SEED"
COLLECTORS = 2
SECONDS_BETWEEN_KILLS = (3, 3, 1.5, 3)  # of servers, collectors, exporters, services
SECONDS_BETWEEN_SCRIPTS = 1
TICK = 0.05
PATIENCE = 150
MESSAGES_A_SECOND = 250  # of the simulated devices together
IDS_A_MESSAGE = 20
REPEATED = 0.1
SIMULATED = "5a" * 13  # how the names of simulated devices end
# What the lists of the configuration allow, as SQL over a device's own store: all, or the messages of the kit, which is
# what is allowed unless something else is.
ALL, KIT = "true", "backend = 'tally' AND name LIKE 'sys.oxbow.tarnkit.%.%'"
COLUMNS = ("devices", "made", "exported", "stored", "kept", "gone", "missing", "double")


class House:
    """A service, programs that report to it by scripts, and its exporter."""

    def __init__(self, programs, folder, number, urls):
        self.programs, self.number = programs, number
        self.is_open = number % 2 == 0
        self.service = Service(os.path.join(programs, "tarnreportingd"), folder)
        self.exporter = Exporter(os.path.join(programs, "tarnreporting-export"), os.path.join(folder, "export"),
                                 f"machine{number}", self.service.state)
        lists = 'others = ["*"]\nkeys = ["*"]\nhashed = []\n' if self.is_open else ""
        self.exporter.configure(f"urls = \"{urls}\"\nanswer_seconds = 2", privacy=lists)
        self.player, self.next_script, self.played = None, 0.0, 0

    def start(self):
        if not self.service.start():
            raise RuntimeError(f"a service ended with {self.service.process.returncode}: {self.service.log_text()}")

    def tick(self, scripts, dice):
        if (self.player is None or self.player.poll() is not None) and time.monotonic() >= self.next_script:
            self.next_script = time.monotonic() + SECONDS_BETWEEN_SCRIPTS * dice.uniform(0.2, 1.8)
            self.played += 1
            self.player = subprocess.Popen(
                [os.path.join(self.programs, "tarnreportingctl"), "--socket", self.service.socket, "run",
                 dice.choice(scripts)], stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)

    def rest(self):
        """No more is made: the programs end, then the service by itself. None when it doesn't."""
        if self.player:
            self.player.wait(60)
        return self.service.stop()

    def recorded(self):
        """What the device's own store has, by id: (payload, whether the lists let it leave)."""
        with sqlite3.connect(f"file:{self.service.store}?mode=ro", uri=True) as store:
            rows = store.execute(f"SELECT id, payload, {ALL if self.is_open else KIT} FROM events").fetchall()
        store.close()
        return {row[0]: row[1:] for row in rows}

    def name(self):
        """As the fleet knows it."""
        asked = subprocess.Popen(self.exporter.command("--show"), stdout=subprocess.PIPE, text=True)
        with asked.stdout:
            line = asked.stdout.readline()
        asked.kill()
        asked.wait()
        return json.loads(line)["device"]

    def end(self):
        for process in (self.player, self.service.process):
            if process is not None and process.poll() is None:
                process.kill()
                process.wait()
        self.exporter.close()


class Town:
    def __init__(self, options, folder):
        self.options, self.folder, self.failures = options, folder, []
        self.dice = random.Random(options.seed)
        self.figures = {"seconds": options.seconds, "services": options.services, "devices": options.devices}
        self.scripts = sorted(path for path in glob.glob(os.path.join(ROOT, "examples", "*.jsonl"))
                              if not path.endswith(".expected.jsonl"))
        self.database = postgres.Database(folder)
        self.cluster = Cluster(folder)
        self.collectors = Collectors(os.path.join(options.programs, "tarnreporting-collect"), folder,
                                     self.cluster.urls, self.database.url)
        self.houses = [House(options.programs, os.path.join(folder, f"house{number}"), number, self.cluster.urls)
                       for number in range(options.services)]
        self.producer, self.truth = None, {}

    def fail(self, text):
        self.failures.append(text)

    def end(self):
        for house in self.houses:
            house.end()
        if self.producer and self.producer.poll() is None:
            self.producer.kill()
            self.producer.communicate()
        self.collectors.end(signal.SIGKILL)
        self.cluster.end()
        self.database.end()

    def run(self):
        self.database.start()
        self.cluster.start()
        self.collectors.migrate()
        for _ in range(COLLECTORS):
            self.collectors.start()
        for house in self.houses:
            house.start()
            house.exporter.start()
        self.begin_simulated()
        self.play()
        self.come_to_rest()
        self.judge()

    def begin_simulated(self):
        options = self.options
        messages = max(1, round(options.seconds * MESSAGES_A_SECOND / options.devices))
        pace = messages * options.devices * (1 + REPEATED) / options.seconds
        words = {"url": self.cluster.urls, "devices": options.devices, "ids": messages * IDS_A_MESSAGE,
                 "batch": IDS_A_MESSAGE, "repeat": REPEATED, "seed": options.seed, "a-second": pace}
        self.producer = subprocess.Popen(
            [options.producer, *(str(word) for key, value in words.items() for word in (f"--{key}", value))],
            stdout=subprocess.PIPE)

    def play(self):
        # Each at least once, however short it is.
        *seconds, of_services = (min(each, self.options.seconds / 2) for each in SECONDS_BETWEEN_KILLS)
        killings = Killings(self.cluster, self.collectors, [house.exporter for house in self.houses], seconds,
                            self.options.seed)
        kills, begun = 0, time.monotonic()
        next_kill = begun + of_services * self.dice.uniform(0.5, 1.5)
        while time.monotonic() - begun < self.options.seconds:
            for house in self.houses:
                house.tick(self.scripts, self.dice)
            if time.monotonic() >= next_kill:
                next_kill = time.monotonic() + of_services * self.dice.uniform(0.5, 1.5)
                house = self.dice.choice(self.houses)
                house.service.kill()
                house.start()
                kills += 1
            time.sleep(TICK)
        counts = {**killings.end(), "service_kills": kills}
        if not all(counts.values()):
            self.fail(f"not all were killed: {counts}")
        self.figures.update(counts, scripts=sum(house.played for house in self.houses))

    def come_to_rest(self):
        begun = time.monotonic()
        for house in self.houses:
            if (status := house.rest()) != 0:
                self.fail(f"service {house.number} ended with {status}: {house.service.log_text()[-300:]}")
        try:
            output = self.producer.communicate(timeout=PATIENCE)[0]
            self.truth = json.loads(output)
        except (subprocess.TimeoutExpired, ValueError):
            raise RuntimeError("the simulated devices didn't get rid of their messages") from None
        last = {house: max(house.recorded(), default=0) for house in self.houses}
        behind = self.houses
        while behind and time.monotonic() - begun < PATIENCE:
            time.sleep(0.1)
            behind = [house for house in behind if house.exporter.cursor() < last[house]]
        for house in behind:
            self.fail(f"service {house.number}: up to {house.exporter.cursor()} of {last[house]} has left: "
                      + " / ".join(house.exporter.logged().splitlines()[-2:]))
        for house in self.houses:
            house.exporter.processes[-1].send_signal(signal.SIGTERM)
        if not drained(self.cluster, PATIENCE):
            self.fail("not all of the stream was taken: " + " / ".join(self.collectors.logged().splitlines()[-3:]))
        self.figures["drain_s"] = round(time.monotonic() - begun, 1)
        if set(statuses := self.collectors.end()) != {0}:
            self.fail(f"the collectors ended with {statuses}")

    def in_stream(self):
        """By device the ids of its records that the stream has, in whatever messages."""
        found = {}
        with self.cluster.servers[0].client(30) as client:
            messages = client.all_messages()
        for _, message in messages:
            batch = batches.read(message)
            found.setdefault(batch.device.hex(), set()).update(batch.events)
        self.figures["messages"] = len(messages)
        return found

    def in_database(self):
        """By device the ids of its records, also those that it has twice."""
        found = {}
        for name, ids in self.database.ask("SELECT d.name, string_agg(e.id::text, ' ' ORDER BY e.id) FROM events AS e "
                                           "JOIN devices AS d ON d.id = e.device GROUP BY 1"):
            found[name] = [int(each) for each in ids.split()]
        return found

    def accounts(self):
        names = ("gaps", "left_out", "missing", "untold")
        return {row[0]: dict(zip(names, map(int, row[1:])))
                for row in self.database.ask(f"SELECT name, {', '.join(names)} FROM account")}

    def judge(self):
        self.exported, self.stored, self.told = self.in_stream(), self.in_database(), self.accounts()
        names = {house.name(): house for house in self.houses}
        simulated = [name for name in self.exported if name.endswith(SIMULATED)]
        if strange := set(self.stored) - set(names) - set(simulated):
            self.fail(f"devices that nobody is: {sorted(strange)[:3]}")
        rows = {"services": self.account_of_services(names), "simulated": self.account_of_simulated(simulated)}
        rows["in all"] = [sum(column) for column in zip(*rows.values())]
        print(f"{'':10}" + "".join(f"{name:>10}" for name in COLUMNS))
        for title, row in rows.items():
            print(f"{title:10}" + "".join(f"{number:10}" for number in row))
        self.figures.update(zip(COLUMNS[1:], rows["in all"][1:]))

    def account_of(self, names, made, kept, gone):
        """A row, once it is even: what was made, what the stream has and what the database has are the same."""
        exported = sum(len(self.exported.get(name, ())) for name in names)
        ids = {name: self.stored.get(name, []) for name in names}
        stored = sum(len(set(each)) for each in ids.values())
        double = sum(map(len, ids.values())) - stored
        for name in names:
            if self.exported.get(name, set()) != set(ids[name]):
                odd = sorted(self.exported.get(name, set()) ^ set(ids[name]))
                self.fail(f"{name}: the stream and the database differ in {len(odd)} records, the first {odd[:3]}")
        told = {key: sum(self.told[name][key] for name in names if name in self.told)
                for key in ("gaps", "left_out", "missing", "untold")}
        if told != (must := {"gaps": gone, "left_out": kept, "missing": 0, "untold": 0}):
            self.fail(f"the database's account says {told}, and it must be {must}")
        if not made == exported == stored or double:
            self.fail(f"{made} made, {exported} exported, {stored} stored, {double} double")
        return [len(names), made, exported, stored, kept, gone, made - stored, double]

    def account_of_services(self, names):
        made = kept = gone = 0
        for name, house in names.items():
            recorded = house.recorded()
            leaves = {each for each, (_, may) in recorded.items() if may}
            made, kept = made + len(leaves), kept + len(recorded) - len(leaves)
            gone += max(recorded, default=0) - len(recorded)
            if leaves != (there := set(self.stored.get(name, ()))):
                self.fail(f"service {house.number}: without {sorted(leaves - there)[:3]}, and too much "
                          f"{sorted(there - leaves)[:3]}")
            if house.is_open:
                self.compare(name, house, recorded)
        return self.account_of(names, made, kept, gone)

    def compare(self, name, house, recorded):
        """Where all may leave it is there as it was recorded."""
        for each, payload in self.database.ask("SELECT e.id, e.payload FROM events AS e JOIN devices AS d ON d.id = "
                                               f"e.device WHERE d.name = '{name}'"):
            was = recorded.get(int(each), ("null",))[0]
            if json.loads(payload) != json.loads(was):
                self.fail(f"service {house.number}: record {each} was {was} and is {payload}")

    def account_of_simulated(self, names):
        if len(names) != self.options.devices:
            self.fail(f"{len(names)} simulated devices are in the stream")
        return self.account_of(names, self.truth["events"], self.truth["left_out"], self.truth["gaps"])


def options_of(words):
    parser = argparse.ArgumentParser(prog="fleet", description=__doc__.splitlines()[0])
    parser.add_argument("--programs", default="build/bin")
    parser.add_argument("--producer", default="build/tests/fleet_producer")
    parser.add_argument("--services", type=int, default=20)
    parser.add_argument("--devices", type=int, default=2000)
    parser.add_argument("--seed", type=int, default=int.from_bytes(os.urandom(4), "big"))
    parser.add_argument("--keep", action="store_true")
    parser.add_argument("seconds", nargs="?", type=float, default=60.0)
    options = parser.parse_args(words)
    options.seed = int(os.environ.get(SEED_VARIABLE, options.seed))
    if options.seconds <= 0 or options.services < 1 or options.devices < 1:
        parser.error("it takes more than nothing")
    return options


def main(words):
    options = options_of(words)
    if lacking := postgres.lacking() or ("" if nats.PROGRAM else "nats-server is not installed here"):
        print(f"fleet: {lacking}", file=sys.stderr)
        return 1
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(143))
    folder = tempfile.mkdtemp(prefix="tarntown")
    town = Town(options, folder)
    try:
        town.run()
    except RuntimeError as problem:
        town.fail(f"it ended early: {problem}")
    finally:
        town.end()
        if options.keep:
            print(f"fleet: kept {folder}", file=sys.stderr)
        else:
            shutil.rmtree(folder, ignore_errors=True)
    print(f"fleet seed={options.seed} " + " ".join(f"{key}={value}" for key, value in town.figures.items())
          + (f": failed({len(town.failures)})" if town.failures else ": held"))
    for text in town.failures[:12]:
        print(f"  {text}", file=sys.stderr)
    if town.failures:
        print(f"  replay: {SEED_VARIABLE}={options.seed} ./dev fleet {options.seconds:g}", file=sys.stderr)
    return 1 if town.failures else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
