# SPDX-License-Identifier: Apache-2.0
"""That the campaign of restarts would notice: what is lost, what is there twice, a period without its summary."""

import sqlite3
import struct
import unittest
from collections import Counter
from types import SimpleNamespace

import restarts
from account import FIRST
from context import Context
from rings import COMMITTED_MESSAGES, HEADER_BYTES, TAKEN_MESSAGES, Program


class RingProgram:
    """A program with one ring, of key 7."""

    numbers = Program.numbers

    def __init__(self):
        self.keys = [7]
        self.headers = [bytearray(HEADER_BYTES)]

    def set(self, taken, committed):
        struct.pack_into("<Q", self.headers[0], TAKEN_MESSAGES, taken)
        struct.pack_into("<Q", self.headers[0], COMMITTED_MESSAGES, committed)


class Restarts(unittest.TestCase):
    def setUp(self):
        self.context = Context("", "", "", 1, 1)
        self.figures = dict.fromkeys(("posted", "recorded", "lost", "doubled", "lost_by_kills", "late_lost",
                                      "oldest_lost_ms", "periods", "odd_periods"), 0)
        self.program = RingProgram()
        self.diary = restarts.Diary([self.program])

    def judge_ring(self, posted, *recorded):
        numbers = Counter(FIRST + number for number in recorded)
        restarts.judge_ring(self.context, self.figures, self.diary, (7, posted, numbers))

    def killed(self, age):
        """At a kill so many seconds after two of three messages were taken, and one of them was committed."""
        self.program.set(2, 1)
        self.diary.pages = [(10.0, self.diary.numbers(TAKEN_MESSAGES))]
        self.program.set(3, 1)
        self.diary.killed(10.0 + age)

    def test_holds_where_each_message_is_there_once(self):
        self.judge_ring(3, 0, 1, 2)
        self.assertEqual((self.context.failures, self.figures["posted"], self.figures["recorded"]), ([], 3, 3))

    def test_finds_what_is_lost_without_a_kill(self):
        self.judge_ring(3, 0, 2)
        self.assertEqual((len(self.context.failures), self.figures["lost"]), (1, 1))

    def test_finds_what_is_there_twice(self):
        self.judge_ring(2, 0, 1, 1)
        self.assertEqual((len(self.context.failures), self.figures["doubled"]), (1, 1))

    def test_finds_what_nobody_posted(self):
        self.judge_ring(1, 0, 1)
        self.assertEqual(len(self.context.failures), 1)

    def test_a_kill_may_cost_what_was_taken_and_not_committed(self):
        self.killed(0.1)
        self.judge_ring(3, 0)
        self.assertEqual((self.context.failures, self.figures["lost_by_kills"]), ([], 2))
        self.assertAlmostEqual(self.figures["oldest_lost_ms"], 100)

    def test_a_kill_may_not_cost_what_was_committed_or_not_taken(self):
        self.killed(0.1)
        self.judge_ring(4, 1, 2)
        self.assertEqual((len(self.context.failures), self.figures["lost"]), (1, 2))

    def test_a_kill_may_not_cost_what_is_older_than_the_window(self):
        self.killed(0.3)
        self.judge_ring(3, 0)
        self.assertEqual((len(self.context.failures), self.figures["late_lost"]), (1, 1))

    def test_the_clock_fails_nothing_among_other_tests(self):
        self.context.brief = True
        self.killed(0.3)
        self.judge_ring(3, 0)
        self.assertEqual((self.context.failures, self.figures["late_lost"]), ([], 1))

    def test_a_message_is_as_old_as_it_was_at_the_kill_that_cost_it(self):
        self.killed(0.1)
        self.program.set(5, 1)
        self.diary.pages = [(11.0, self.diary.numbers(TAKEN_MESSAGES))]
        self.diary.killed(12.0)
        self.judge_ring(3, 0)
        self.assertAlmostEqual(self.figures["oldest_lost_ms"], 100)

    def judge_periods(self, reason, stopped, summaries):
        store = sqlite3.connect(":memory:")
        store.executescript("CREATE TABLE sessions(id, end_reason); CREATE TABLE periods(session, stopped);"
                            "CREATE TABLE events(session, name)")
        store.execute("INSERT INTO sessions VALUES(1, ?)", (reason,))
        store.execute("INSERT INTO periods VALUES(1, ?)", (stopped,))
        store.executemany("INSERT INTO events VALUES(1, ?)",
                          [("sys.oxbow.tarnkit.Session_Generic.Summary",)] * summaries + [("another",)])
        restarts.judge_periods(self.context, self.figures, SimpleNamespace(reader=lambda: store))
        return self.figures["odd_periods"]

    def test_a_period_has_one_summary(self):
        self.assertEqual(self.judge_periods("service-stopping", 1.0, 1), 0)

    def test_finds_a_period_without_its_summary(self):
        self.assertEqual(self.judge_periods("service-stopping", 1.0, 0), 1)

    def test_finds_two_summaries_of_a_period(self):
        self.assertEqual(self.judge_periods("stopped", 1.0, 2), 1)

    def test_finds_a_period_that_never_stopped(self):
        self.assertEqual(self.judge_periods(None, None, 1), 1)

    def test_what_was_killed_has_none(self):
        self.assertEqual(self.judge_periods("killed", None, 0), 0)


if __name__ == "__main__":
    unittest.main()
