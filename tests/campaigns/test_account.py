# SPDX-License-Identifier: Apache-2.0
"""That a campaign would notice: the account of numbered messages, and the image of a power cut."""

import os
import random
import unittest
from unittest import mock

import powercut
from account import FIRST, judge, message_parts
from campaign import SEED_VARIABLE, figures_line, runs_of
from context import Context
from wire import PLAYBACK, PLAYBACK_START, SEND, request


class Sent:
    def __init__(self, key, answers=(), settled=0, refused=()):
        self.key, self.answers, self.refused = key, list(answers), set(refused)
        self.settled = FIRST - 1 + settled
        self.next = FIRST + 10


class Account(unittest.TestCase):
    def test_finds_nothing_where_each_answered_message_is_there_once(self):
        verdict = judge([(1, FIRST), (1, FIRST + 1)], [Sent(1, [(0.0, [FIRST, FIRST + 1])], 2)], {(1, FIRST)}, 10.0)
        self.assertEqual((verdict.doubled, verdict.committed_lost, verdict.settled_lost, verdict.late_lost), ([],) * 4)
        self.assertEqual((verdict.answered, verdict.rows, verdict.lost), (2, 2, 0))

    def test_finds_what_is_there_twice(self):
        self.assertEqual(judge([(1, FIRST), (1, FIRST)], [Sent(1)]).doubled, [(1, FIRST)])

    def test_finds_what_somebody_has_read_and_is_gone(self):
        self.assertEqual(judge([], [Sent(1)], {(1, FIRST)}).committed_lost, [(1, FIRST)])

    def test_finds_what_was_settled_and_is_gone_but_for_what_was_refused(self):
        self.assertEqual(judge([], [Sent(1, settled=2, refused=[FIRST])]).settled_lost, [(1, FIRST + 1)])

    def test_tells_late_losses_from_those_that_a_kill_may_cost(self):
        verdict = judge([], [Sent(1, [(9.7, [FIRST]), (9.9, [FIRST + 1])])], ended=10.0)
        self.assertEqual(verdict.late_lost, [(1, FIRST)])
        self.assertEqual(verdict.lost, 2)
        self.assertAlmostEqual(verdict.oldest_lost_ms, 300)

    def test_takes_every_loss_for_late_when_nobody_was_killed(self):
        self.assertEqual(judge([], [Sent(1, [(9.9, [FIRST])])]).late_lost, [(1, FIRST)])

    def test_finds_rows_that_nobody_sent(self):
        self.assertEqual(judge([(1, FIRST + 10), (2, 5)], [Sent(1)]).invented, [(1, FIRST + 10)])

    def test_makes_the_frame_of_any_number_from_the_same_parts(self):
        number = (FIRST + 77).to_bytes(4, "big")
        whole = request(FIRST + 77, SEND, {"campaign_client": 3, "campaign_number": FIRST + 77}, PLAYBACK,
                        PLAYBACK_START, [3])
        self.assertEqual(number.join(message_parts(3)), whole)


class PowerCut(unittest.TestCase):
    ENTRIES = ((powercut.MADE, "a", 0, b""), (powercut.WRITTEN, "a", 0, b"one"), (powercut.SYNCHRONISED, "a", 0, b""),
               (powercut.WRITTEN, "a", 3, b"two"))

    def content(self, entries, share):
        return bytes(powercut.disks_after(entries)["a"].after_cut(random.Random(1), share))

    def test_keeps_what_was_synchronised(self):
        self.assertEqual(self.content(self.ENTRIES, 0.0), b"one")

    def test_may_keep_what_was_not(self):
        self.assertEqual(self.content(self.ENTRIES, 1.0), b"onetwo")

    def test_may_lose_a_sector_in_the_midst(self):
        large = (powercut.WRITTEN, "a", 3, b"x" * (powercut.SECTOR * 40))
        content = self.content((*self.ENTRIES[:3], large), 0.5)
        self.assertIn(b"\0" * powercut.SECTOR, content)
        self.assertIn(b"x" * powercut.SECTOR, content)

    def test_follows_a_file_to_its_new_name(self):
        disks = powercut.disks_after((*self.ENTRIES, (powercut.RENAMED, "a", 0, b"b")))
        self.assertEqual(list(disks), ["b"])

    def test_cuts_a_file_and_lengthens_it_with_zeros(self):
        self.assertEqual(self.content((*self.ENTRIES, (powercut.CUT, "a", 1, b"")), 1.0), b"o")
        self.assertEqual(self.content((*self.ENTRIES[:3], (powercut.CUT, "a", 5, b"")), 1.0), b"one\0\0")


class Line(unittest.TestCase):
    def test_tells_seed_figures_and_verdict(self):
        context = Context("program", "shims", "folder", 1, 4711)
        self.assertEqual(figures_line("kills", context, {"kills": 3, "worst_ms": 1.25}),
                         "campaign kills seed=4711 kills=3 worst_ms=1.2: held")
        context.fail("something")
        self.assertEqual(figures_line("kills", context, {}), "campaign kills seed=4711 : failed(1)")


class Seeds(unittest.TestCase):
    def setUp(self):
        patched = mock.patch.dict(os.environ)
        patched.start()
        self.addCleanup(patched.stop)
        os.environ.pop(SEED_VARIABLE, None)

    def test_fixed_one_is_played_whole_and_a_fresh_one_half_as_long(self):
        first, second = (runs_of("1", True, 8) for _ in range(2))
        self.assertEqual((first[0], second[0]), ((1, 8), (1, 8)))
        self.assertEqual((first[1][1], second[1][1]), (4, 4))
        self.assertNotEqual(first[1][0], second[1][0])

    def test_one_that_is_asked_for_is_played_alone(self):
        self.assertEqual(runs_of("1", False, 8), [(1, 8)])
        os.environ[SEED_VARIABLE] = "4711"
        self.assertEqual(runs_of("1", True, 8), [(4711, 8)])

    def test_without_any_a_fresh_one_is_played_whole(self):
        first, second = (runs_of(None, False, 8) for _ in range(2))
        self.assertEqual((len(first), first[0][1]), (1, 8))
        self.assertNotEqual(first, second)

    def test_text_that_is_no_number_ends_it(self):
        os.environ[SEED_VARIABLE] = "x"
        with self.assertRaises(SystemExit):
            runs_of("1", True, 8)


if __name__ == "__main__":
    unittest.main()
