# SPDX-License-Identifier: Apache-2.0
"""That the campaign of system calls tries all: each site at three of its calls, in each way, over all shares."""

import random
import unittest

import syscalls
from control import KINDS

SITES = {("read", 5): 7, ("read", 9): 1, ("sync", 3): 2, ("sync", 11): 4}


class Sites(unittest.TestCase):
    def test_fail_at_the_first_the_middle_and_the_last_call_in_each_way(self):
        faults = syscalls.faults_of({("sync", 3): 7}, random.Random(1))
        self.assertEqual(sorted(faults), sorted(("sync", 3, ordinal, how)
                                                for ordinal in (1, 4, 7) for how in KINDS["sync"]))

    def test_with_few_calls_fail_at_each_once(self):
        for count, ordinals in ((1, {1}), (2, {1, 2}), (3, {1, 2, 3})):
            faults = syscalls.faults_of({("sync", 3): count}, random.Random(1))
            self.assertEqual({ordinal for _, _, ordinal, _ in faults}, ordinals)
            self.assertEqual(len(faults), len(ordinals) * len(KINDS["sync"]))

    def test_kinds_take_turns(self):
        faults = syscalls.faults_of(SITES, random.Random(1))
        self.assertEqual({kind for kind, *_ in faults[:2]}, {"read", "sync"})

    def test_are_each_in_one_share(self):
        shares = [syscalls.share_of(SITES, part, 3) for part in range(3)]
        self.assertEqual(sum(map(len, shares)), len(SITES))
        self.assertEqual({key: count for share in shares for key, count in share.items()}, SITES)


if __name__ == "__main__":
    unittest.main()
