# SPDX-License-Identifier: Apache-2.0
"""Makes a recorder's file with sessions in it, as random as the seed says, for tests and measurements of reports.

usage: make_store.py FILE [--sessions N] [--events N] [--days N] [--seed N] [--hostile] [--open]

The file has the tables that a service would have written, as far as readers know them. A message becomes three events,
as with a service: two analytics events and one of the mirror. --hostile: names hold what a page must not take for
markup. --open: the last session hasn't ended.
"""

import argparse
import json
import os
import random
import sqlite3

END = 1700481600.0  # 2023-11-20 12:00:00 UTC
TABLES = """
CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT,
  session INTEGER);
CREATE TABLE runs(id INTEGER PRIMARY KEY, boot TEXT, version TEXT, started REAL, ended REAL, end_reason TEXT);
CREATE TABLE sessions(id INTEGER PRIMARY KEY, run INTEGER, reporter INTEGER, connection INTEGER, pid INTEGER,
  uid INTEGER, process TEXT, application TEXT, service_type INTEGER, service_name TEXT, created REAL, ended REAL,
  end_reason TEXT);
CREATE TABLE periods(id INTEGER PRIMARY KEY, session INTEGER, started REAL, stopped REAL, messages INTEGER,
  redundant INTEGER, first_event INTEGER, last_event INTEGER);
PRAGMA user_version = 1;
"""
SERVICES = ((7, "longformaudio"), (2, "telephony"), (8, "nonlongformaudio"), (13, "systemsounds"))
APPLICATIONS = ("org.example.player", "org.example.call", "org.example.game", "org.example.books", "Unknown")
HOSTILE = ("</td><script>alert(1)</script>", "a & b \"c\" 'd'", "\u202etxt\u0007", "x" * 300, "]]>&#0;<!--")
ROUTES = ("Speaker", "HeadphonesBT", "LineOut")
REASONS = ("stopped", "destroyed", "replaced", "retyped", "client-gone", "service-stopping", "killed")


class Store:
    """The file that grows; `count` events so far."""

    def __init__(self, path):
        if os.path.exists(path):
            os.remove(path)
        self.database = sqlite3.connect(path, isolation_level=None)
        self.database.executescript("PRAGMA journal_mode=OFF; PRAGMA synchronous=OFF;" + TABLES + "BEGIN;")
        self.count = 0
        self.rows = []

    def event(self, session, time, backend, name, payload, detail):
        self.count += 1
        self.rows.append((self.count, time, backend, name, payload, detail, session))
        if len(self.rows) == 5000:
            self.flush()

    def flush(self):
        self.database.executemany("INSERT INTO events VALUES(?, ?, ?, ?, ?, ?, ?)", self.rows)
        self.rows = []

    def close(self):
        self.flush()
        self.database.execute("COMMIT")
        self.database.close()


class Session:
    """One session, whose messages are written as they come."""

    def __init__(self, store, number, dice, created, arguments):
        self.store, self.number, self.dice = store, number, dice
        self.service_type, self.service = dice.choice(SERVICES)
        names = APPLICATIONS + (HOSTILE if arguments.hostile else ())
        self.application, self.process = dice.choice(names), dice.choice(names)
        self.created = created
        self.messages = 0
        self.segments = []

    def message(self, kind, time, fields):
        payload = json.dumps({**fields, "tarnreporting_timestamp": time, "audiotag": kind.replace(".", ""),
                              "HostApplicationDisplayID": self.application}, separators=(",", ":"),
                             ensure_ascii=False)
        self.messages += 1
        self.store.event(self.number, time, "tally", "sys.oxbow.tarnkit." + kind, payload, "{}")
        self.store.event(self.number, time, "tally", f"sys.oxbow.{self.service}.{kind}", payload, "{}")
        self.store.event(self.number, time, "rtc", "sendMessage", payload, '{"session":1,"category":4,"type":1}')

    def fault(self, time):
        dice = self.dice.random()
        if dice < 0.5:
            self.message("IO.Error", time, {"issue_type": "overload", "smallest_buffer_frame_size": 256})
        elif dice < 0.6:
            self.message("Performance.Generic", time, {"issue_type": "overload"})
        elif dice < 0.7:
            self.message("Generic.Stop", time, {"issue_type": "overload", "session_duration": 1.5})
        elif dice < 0.85:
            self.message("Error.Error", time, {"issue_type": "xrun <&>"})
        else:
            self.message("Performance.IssueDetector", time, {"issue_type": "Silence", "node": "mixer"})

    def play(self, start, length, wanted):
        """Messages of one period, `wanted` of them at least; what they come to follows at the stop."""
        dice, volume, route = self.dice, round(self.dice.random(), 3), self.dice.choice(ROUTES)
        step = length / (wanted + 2)
        self.message("Playback.Start", start + step / 2, {"session_output_running": True, "KvSessionVolume": volume,
                                                          "active_devices": route})
        begun = start + step / 2
        for place in range(wanted):
            time, roll = start + step * (place + 1), dice.random()
            if roll < 0.03:
                self.segments.append((volume, time - begun, route))
                volume, begun = round(dice.random(), 3), time
                self.message("Volume.Generic", time, {"KvSessionVolume": volume})
            elif roll < 0.05:
                self.segments.append((volume, time - begun, route))
                route, begun = dice.choice(ROUTES), time
                self.message("RouteChange.Generic", time, {"active_devices": route})
            elif roll < 0.07:
                self.fault(time)
            else:
                self.message("Performance.Generic", time, {"io_cycle": place, "load": round(dice.random(), 6),
                                                           "mChannelsPerFrame": 2, "mFormatID": "lpcm"})
        self.segments.append((volume, start + length - begun, route))
        self.message("Playback.Stop", start + length - step / 4, {"session_output_running": False})
        self.derive(start + length)

    def derive(self, time):
        for index, (volume, seconds, route) in enumerate(self.segments):
            self.message("Volume.Summary", time, {"play_seconds": seconds, "KvSessionVolume": volume,
                                                  "active_devices": route, "mFormatID": "lpcm", "msgidx": index + 1,
                                                  "msgcnt": len(self.segments)})
        self.segments = []
        self.message("Flume.Simple", time, {"OxbowFoo_Haptics_Stats_Simple_EngineOn": self.number % 7 + 1})


def make(path, arguments):
    dice = random.Random(arguments.seed)
    store = Store(path)
    insert = store.database.execute
    insert("INSERT INTO runs VALUES(1, 'boot', '0.1.0', ?, NULL, NULL)", (END - arguments.days * 86400,))
    created = sorted(END - dice.random() * arguments.days * 86400 for _ in range(arguments.sessions))
    periods = 0
    for number, time in enumerate(created, 1):
        session = Session(store, number, dice, time, arguments)
        left = arguments.events - store.count
        wanted = max(3, left // 3 // (arguments.sessions - number + 1))
        # Some are small, some are long, and what one doesn't take the next ones do.
        wanted = wanted if number == arguments.sessions else max(3, int(wanted * dice.choice((0.02, 0.5, 1, 1.5, 2))))
        parts, at = dice.choice((1, 1, 2)), time + dice.random()
        is_open = arguments.open and number == arguments.sessions
        for part in range(parts):
            length = dice.uniform(1, 3000)
            before, first = session.messages, store.count + 1
            session.play(at, length, wanted // parts)
            periods += 1
            stopped = None if is_open and part == parts - 1 else at + length
            insert("INSERT INTO periods VALUES(?, ?, ?, ?, ?, ?, ?, ?)",
                   (periods, number, at, stopped, session.messages - before, dice.randrange(5), first, store.count))
            at += length + dice.random()
        insert("INSERT INTO sessions VALUES(?, 1, ?, 1, ?, 1000, ?, ?, ?, ?, ?, ?, ?)",
               (number, 1000 + number, 4000 + number, session.process, session.application, session.service_type,
                session.service, time, None if is_open else at, None if is_open else dice.choice(REASONS)))
    # What belongs to no session must not count.
    store.event(None, END, "tally", "sys.oxbow.tarnkit.IO.Error", '{"issue_type":"overload"}', "{}")
    store.close()


def parsed(arguments=None):
    parser = argparse.ArgumentParser(description=__doc__.split("\n", 1)[0])
    parser.add_argument("file")
    parser.add_argument("--sessions", type=int, default=40)
    parser.add_argument("--events", type=int, default=20000)
    parser.add_argument("--days", type=float, default=10)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--hostile", action="store_true")
    parser.add_argument("--open", action="store_true")
    return parser.parse_args(arguments)


if __name__ == "__main__":
    given = parsed()
    make(given.file, given)
