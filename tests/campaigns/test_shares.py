# SPDX-License-Identifier: Apache-2.0
"""Which share of a campaign a part is, and that the shares of the allocations are all of them, each once."""

import random
import types
import unittest

import allocations
from context import Context


def context_of(part):
    return Context("", "", "", 1, 4711, only=part)


class FakeTrials:
    """Counts as given."""

    one, one_start, one_end = "one", "start", "end"

    def count(self, scenario):
        return 30 + len(scenario.__name__)

    def count_life(self):
        return 200, 70


def trials_of(part):
    context = types.SimpleNamespace(random=random.Random(7), share=context_of(part).share)
    return [(name, *arguments[-2:]) for name, _, arguments in allocations.all_trials(context, FakeTrials())]


class Shares(unittest.TestCase):
    def test_are_counted_from_one(self):
        self.assertEqual(context_of("2of5").share(), (1, 5))

    def test_of_no_part_are_all(self):
        self.assertEqual(context_of("").share(), (0, 1))

    def test_that_there_are_not_are_refused(self):
        for part in ("0of3", "4of3", "half", "1of", "1of2x"):
            with self.assertRaises(ValueError):
                context_of(part).share()

    def test_of_allocations_are_all_of_them_once(self):
        everything = trials_of("")
        shares = [trials_of(f"{number}of3") for number in (1, 2, 3)]
        self.assertEqual(sorted(everything), sorted(sum(shares, [])))
        self.assertEqual(len(set(everything)), len(everything))
        for share in shares:  # none is much larger than another
            self.assertLess(abs(len(share) - len(everything) / 3), len(everything) / 30)


if __name__ == "__main__":
    unittest.main()
