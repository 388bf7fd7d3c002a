# SPDX-License-Identifier: Apache-2.0
"""tarnreporting-export with a real server: what arrives, and what becomes of it when the server doesn't take it."""

import os
import re
import shutil
import signal
import sqlite3
import subprocess
import sys
import tempfile
import time
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import nats  # noqa: E402

EXPORT = os.environ["EXPORT"]
MESSAGE_ID = re.compile(r"Nats-Msg-Id: *([0-9a-f]{32})\.(\d+)-(\d+)\.[0-9a-f]{32}")
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


@unittest.skipUnless(nats.PROGRAM, "nats-server is not installed here")
class JetStream(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarnjetstream")
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.state, self.own = (os.path.join(self.folder, name) for name in ("state", "own"))
        os.mkdir(self.state)
        self.store = sqlite3.connect(os.path.join(self.state, "recorder.sqlite3"))
        self.addCleanup(self.store.close)
        self.store.executescript(TABLES)
        self.last = 0
        self.server = nats.Server(self.folder)
        self.addCleanup(self.server.end)
        self.log = os.path.join(self.folder, "log")
        self.write("fleet.key", "7" * 64)
        self.write("machine-id", "0123456789abcdef0123456789abcdef\n")
        self.configure(f"urls = \"{self.server.url}\"")

    def write(self, name, text):
        with open(os.path.join(self.folder, name), "w", encoding="utf-8") as file:
            file.write(text)

    def configure(self, server, mode="export"):
        self.write("export.toml", f"[privacy]\nmode = \"{mode}\"\nkey_file = \"{self.folder}/fleet.key\"\n"
                   f"[server]\n{server}\n")

    def record(self, count):
        for _ in range(count):
            self.last += 1
            self.store.execute("INSERT INTO event_texts VALUES(?, NULL, NULL, '{\"play_seconds\":1.5}')",
                               (2 * self.last,))
            self.store.execute("INSERT INTO event_texts VALUES(?, 'tally', 'sys.oxbow.tarnkit.Volume.Summary', '{}')",
                               (2 * self.last + 1,))
            self.store.execute("INSERT INTO event_rows VALUES(?, 1795158000, 0, 0, NULL, 1)", (self.last,))
        self.store.commit()

    def start(self, *words):
        with open(self.log, "ab") as log:
            process = subprocess.Popen(
                [EXPORT, "--config", os.path.join(self.folder, "export.toml"), "--state-dir", self.state, "--own-dir",
                 self.own, "--machine-id", os.path.join(self.folder, "machine-id"), "--log-level", "debug", *words],
                stdout=log, stderr=log)
        self.addCleanup(process.wait)
        self.addCleanup(process.kill)
        return process

    def cursor(self):
        try:
            with open(os.path.join(self.own, "cursor"), encoding="utf-8") as file:
                return int(file.readline().split()[2])
        except FileNotFoundError:
            return 0

    def logged(self):
        with open(self.log, encoding="utf-8") as file:
            return file.read()

    def arrived(self):
        """The ranges of ids of the stream's messages, in their order."""
        with nats.Client(self.server.port) as client:
            found = [MESSAGE_ID.search(client.message(number + 1)[0]) for number in range(client.messages())]
        return [(int(each[2]), int(each[3])) for each in found]

    def make_stream(self, **options):
        with nats.Client(self.server.port) as client:
            client.make_stream(**options)

    def test_what_is_recorded_arrives_once_and_the_program_goes_on_where_it_was(self):
        self.server.start()
        self.make_stream()
        self.record(5000)
        self.assertEqual(self.start("--once").wait(30), 0, self.logged())
        ranges = self.arrived()
        self.assertEqual([first for first, _ in ranges], [1] + [last + 1 for _, last in ranges[:-1]])
        self.assertEqual(ranges[-1][1], 5000)
        self.assertEqual(self.cursor(), 5000)
        self.record(10)
        self.assertEqual(self.start("--once").wait(30), 0, self.logged())
        self.assertEqual(self.arrived(), [*ranges, (5001, 5010)])

    def test_a_message_that_comes_again_is_dropped_by_its_id(self):
        self.server.start()
        self.make_stream()
        self.record(3000)
        self.assertEqual(self.start("--once").wait(30), 0)
        ranges = self.arrived()
        os.unlink(os.path.join(self.own, "cursor"))
        self.assertEqual(self.start("--once").wait(30), 0)
        self.assertEqual(self.arrived(), ranges)

    def test_a_server_that_comes_later_and_is_killed_misses_nothing(self):
        self.record(100)
        process = self.start()
        self.assertTrue(eventually(lambda: "messages aren't taken: " in self.logged()))
        self.server.start()
        self.make_stream()
        self.assertTrue(eventually(lambda: self.cursor() == 100), self.logged())
        self.server.end()
        self.record(100)
        self.assertTrue(eventually(lambda: self.logged().count("messages aren't taken: ") >= 2), self.logged())
        self.server.start()
        self.assertTrue(eventually(lambda: self.cursor() == 200), self.logged())
        self.assertIn("messages are taken again, after ", self.logged())
        process.send_signal(signal.SIGTERM)
        self.assertEqual(process.wait(10), 0)
        self.assertEqual(self.arrived()[-1][1], 200)

    def test_a_stream_that_is_not_there_or_full_is_waited_for(self):
        self.server.start()
        self.record(100)
        self.start()
        self.assertTrue(eventually(lambda: "messages aren't taken: " in self.logged()), self.logged())
        self.make_stream(max_msgs=1)
        self.assertTrue(eventually(lambda: self.cursor() == 100), self.logged())
        self.record(100)
        self.assertTrue(eventually(lambda: "maximum messages exceeded" in self.logged()), self.logged())
        self.assertEqual(self.cursor(), 100)
        with nats.Client(self.server.port) as client:
            client.change_stream(max_msgs=-1)
        self.assertTrue(eventually(lambda: self.cursor() == 200), self.logged())

    def test_settings_that_are_wrong_are_told_and_end_it(self):
        self.configure(f"urls = \"{self.server.url}\"\nauthority_file = \"{self.folder}/none\"")
        self.assertEqual(self.start().wait(10), 1)
        self.assertIn("/none: ", self.logged())
        self.configure("urls = \"nats://[\"")
        self.assertEqual(self.start().wait(10), 78)
        self.assertIn("\"server.urls\" must be addresses", self.logged())
        self.configure(f"urls = \"{self.server.url}\"")
        os.unlink(os.path.join(self.folder, "fleet.key"))
        self.assertEqual(self.start().wait(10), 78)
        self.assertIn("fleet.key: No such file or directory", self.logged())

    def test_local_keeps_messages_on_the_machine_and_needs_no_server(self):
        self.configure("", mode="local")
        self.record(100)
        self.assertEqual(self.start("--once").wait(30), 0, self.logged())
        [name] = os.listdir(os.path.join(self.own, "messages"))
        self.assertRegex(name, r"^[0-9a-f]{32}\.1-100\.[0-9a-f]{32}\.tnf$")
        self.assertEqual(self.cursor(), 100)

    def test_two_of_them_do_not_work_with_one_cursor(self):
        self.server.start()
        self.make_stream()
        self.record(1)
        self.start()
        self.assertTrue(eventually(lambda: self.cursor() == 1), self.logged())
        self.assertEqual(self.start("--once").wait(10), 1)
        self.assertIn("another one works with it", self.logged())


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
