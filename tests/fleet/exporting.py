# SPDX-License-Identifier: Apache-2.0
"""The real tarnreporting-export, also beside a made-up device: a store as the recorder writes it."""

import json
import os
import sqlite3
import subprocess
import time

RECORDED = 1795158000  # epoch seconds
TABLES = """
PRAGMA journal_mode = WAL;
PRAGMA user_version = 1;
CREATE TABLE runs(id INTEGER PRIMARY KEY, boot TEXT, version TEXT, started REAL, ended REAL, end_reason TEXT);
CREATE TABLE sessions(id INTEGER PRIMARY KEY, run INTEGER, reporter INTEGER, connection INTEGER, pid INTEGER,
  uid INTEGER, process TEXT, application TEXT, service_type INTEGER, service_name TEXT, created REAL, ended REAL,
  end_reason TEXT);
CREATE TABLE periods(id INTEGER PRIMARY KEY, session INTEGER, started REAL, stopped REAL, messages INTEGER,
  redundant INTEGER, first_event INTEGER, last_event INTEGER);
CREATE TABLE redundant_messages(id INTEGER PRIMARY KEY, session INTEGER, period INTEGER, time REAL, stamp REAL,
  event INTEGER, after_event INTEGER);
CREATE TABLE event_rows(id INTEGER PRIMARY KEY, time REAL, kind INTEGER, payload INTEGER, cut INTEGER,
  session INTEGER);
CREATE TABLE event_texts(id INTEGER PRIMARY KEY, backend TEXT, name TEXT, text TEXT);
CREATE TABLE event_times(block INTEGER PRIMARY KEY, earliest REAL, latest REAL);
CREATE TABLE session_spans(session INTEGER, first INTEGER, PRIMARY KEY(session, first)) WITHOUT ROWID;
CREATE VIEW events AS SELECT r.id AS id, r.time AS time, k.backend AS backend, k.name AS name, p.text AS payload,
  k.text AS detail, r.session AS session FROM event_rows AS r CROSS JOIN event_texts AS k ON k.id = 2 * (r.id - r.kind)
  + 1 LEFT JOIN event_texts AS p ON p.id = 2 * (r.id - r.payload);
INSERT INTO runs VALUES(1, 'boot', '1.2.3', 1795150000, NULL, NULL);
INSERT INTO sessions VALUES(1, 1, 4101, 3, 812, 1000, 'player', 'org.example.music', 7, 'longformaudio', 1795158000,
  NULL, NULL);
"""


def eventually(holds, patience=30):
    until = time.monotonic() + patience
    while time.monotonic() < until:
        if holds():
            return True
        time.sleep(0.05)
    return False


class Exporter:
    """The real program; all that is its own lies in a folder. close() ends what it started."""

    def __init__(self, program, folder, machine="0123456789abcdef0123456789abcdef", state=""):
        self.program, self.folder = program, folder
        self.state = state or os.path.join(folder, "state")
        self.own, self.log = (os.path.join(folder, name) for name in ("own", "log"))
        for path in (folder, *(() if state else (self.state,))):
            os.makedirs(path, exist_ok=True)
        self.processes = []
        self.write("fleet.key", "7" * 64)
        self.write("machine-id", machine + "\n")

    def close(self):
        self.kill()

    def write(self, name, text):
        with open(os.path.join(self.folder, name), "w", encoding="utf-8") as file:
            file.write(text)

    def configure(self, server, mode="export", privacy=""):
        self.write("export.toml", f"[privacy]\nmode = \"{mode}\"\nkey_file = \"{self.folder}/fleet.key\"\n{privacy}"
                   f"[server]\n{server}\n")

    def command(self, *words):
        return [self.program, "--config", os.path.join(self.folder, "export.toml"), "--state-dir", self.state,
                "--own-dir", self.own, "--machine-id", os.path.join(self.folder, "machine-id"), "--log-level", "debug",
                *words]

    def status(self):
        """What --status prints."""
        done = subprocess.run(self.command("--status"), capture_output=True, text=True, timeout=30, check=True)
        return json.loads(done.stdout)

    def start(self, *words, **variables):
        self.processes = [each for each in self.processes if each.poll() is None]
        with open(self.log, "ab") as log:
            process = subprocess.Popen(self.command(*words), stdout=log, stderr=log, env={**os.environ, **variables})
        self.processes.append(process)
        return process

    def kill(self):
        for process in self.processes:
            process.kill()
            process.wait()

    def cursor(self):
        try:
            with open(os.path.join(self.own, "cursor"), encoding="utf-8") as file:
                return int(file.readline().split()[2])
        except FileNotFoundError:
            return 0

    def logged(self):
        with open(self.log, encoding="utf-8") as file:
            return file.read()


class Device(Exporter):
    """An exporter beside a store that the test itself fills."""

    def __init__(self, program, folder, machine="0123456789abcdef0123456789abcdef", number=0):
        super().__init__(program, folder, machine)
        self.number, self.last = number, 0
        self.store = sqlite3.connect(os.path.join(self.state, "recorder.sqlite3"))
        self.store.executescript(TABLES)
        self.store.execute("PRAGMA synchronous = OFF")  # who writes isn't what is tried

    def close(self):
        super().close()
        self.store.close()

    def payload(self, event):
        return f'{{"play_seconds":{event},"session_duration":{self.number}}}'

    def record(self, count):
        """Events that say their id and the device's number."""
        ids = range(self.last + 1, self.last + count + 1)
        with self.store:
            self.store.executemany("INSERT INTO event_texts VALUES(?, NULL, NULL, ?)",
                                   [(2 * each, self.payload(each)) for each in ids])
            self.store.executemany(
                "INSERT INTO event_texts VALUES(?, 'tally', 'sys.oxbow.tarnkit.Volume.Summary', '{}')",
                [(2 * each + 1,) for each in ids])
            self.store.executemany("INSERT INTO event_rows VALUES(?, ?, 0, 0, NULL, 1)",
                                   [(each, RECORDED) for each in ids])
        self.last += count
