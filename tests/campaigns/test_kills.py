# SPDX-License-Identifier: Apache-2.0
"""That the campaign of kills would notice: its look at the store, played on stores that were tampered with."""

import json
import os
import sqlite3
import tempfile
import unittest

import kills
from account import FIRST
from context import Context

SENT = range(FIRST, FIRST + 50)
KILLED = 100.0  # when, by the senders' clock


class Sender:
    """One that was answered all of its messages a second before the kill, and knows of the first ten that they are
    committed."""

    key, next, refused = 7, SENT.stop, frozenset()
    answers = [(KILLED - 1, list(SENT))]
    settled = FIRST + 9


class Watcher:
    """Has read the first five."""

    seen = {(Sender.key, number) for number in SENT[:5]}


class Service:
    """A service after its restart, with a store in which these messages are."""

    def __init__(self, path, numbers):
        self.path = path
        with sqlite3.connect(path) as store:
            store.execute("CREATE TABLE events(id INTEGER PRIMARY KEY, backend TEXT, name TEXT, payload TEXT)")
            store.executemany("INSERT INTO events(backend, name, payload) VALUES('tally', ?, ?)", [
                ("sys.oxbow.tarnkit.campaign",
                 json.dumps({"campaign_client": Sender.key, "campaign_number": number})) for number in numbers])
        store.close()

    def connect(self):
        return self

    def __enter__(self):
        return self

    def __exit__(self, *_):
        pass

    def settle(self):
        return True

    def reader(self):
        return sqlite3.connect(self.path)


class Kills(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.store = os.path.join(folder.name, "store")
        self.context = Context("", "", "", 1, 1)
        self.figures = kills.no_figures()

    def look_at(self, numbers):
        service = Service(self.store, numbers)
        return kills.look(self.context, self.figures, service, ([Sender()], Watcher(), KILLED), 0)

    def found(self):
        return {name: self.figures[name] for name in ("committed_lost", "settled_lost", "late_lost", "doubled")}

    def test_hold_when_each_message_is_there_once(self):
        self.assertEqual(self.look_at(SENT), 50)
        self.assertEqual(self.context.failures, [])
        self.assertEqual(self.found(), {"committed_lost": 0, "settled_lost": 0, "late_lost": 0, "doubled": 0})
        self.assertEqual((self.figures["answered"], self.figures["rows"]), (50, 50))

    def test_fail_by_one_row_that_somebody_had_read(self):
        self.look_at(SENT[1:])
        self.assertEqual(self.found(), {"committed_lost": 1, "settled_lost": 1, "late_lost": 1, "doubled": 0})
        self.assertEqual(len(self.context.failures), 3)

    def test_fail_by_one_row_that_was_settled(self):
        self.look_at([number for number in SENT if number != FIRST + 9])
        self.assertEqual(self.found(), {"committed_lost": 0, "settled_lost": 1, "late_lost": 1, "doubled": 0})

    def test_fail_by_one_row_that_was_answered_long_before(self):
        self.look_at(SENT[:-1])
        self.assertEqual(self.found(), {"committed_lost": 0, "settled_lost": 0, "late_lost": 1, "doubled": 0})
        self.assertEqual(len(self.context.failures), 1)

    def test_fail_by_one_row_that_is_there_twice(self):
        self.look_at([*SENT, FIRST + 30])
        self.assertEqual(self.found(), {"committed_lost": 0, "settled_lost": 0, "late_lost": 0, "doubled": 1})
        self.assertEqual(len(self.context.failures), 1)

    def test_fail_by_a_row_that_nobody_sent(self):
        self.look_at([*SENT, SENT.stop])
        self.assertEqual(self.found(), {"committed_lost": 0, "settled_lost": 0, "late_lost": 0, "doubled": 0})
        self.assertEqual(len(self.context.failures), 1)


if __name__ == "__main__":
    unittest.main()
