# SPDX-License-Identifier: Apache-2.0
"""tarnreporting-export with three servers that keep one stream: one of them is killed, and nothing waits for it."""

import os
import shutil
import sys
import tempfile
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import batches  # noqa: E402
import nats  # noqa: E402
from cluster import Cluster  # noqa: E402
from exporting import Device, eventually  # noqa: E402

EXPORT = os.environ["EXPORT"]
DEVICES = 6
AT_ONCE = 200


@unittest.skipUnless(nats.PROGRAM, "nats-server is not installed here")
class OneOfThree(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarncluster")
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.cluster = Cluster(self.folder)
        self.addCleanup(self.cluster.end)
        self.cluster.start()
        self.devices = []
        for number in range(DEVICES):
            device = Device(EXPORT, os.path.join(self.folder, f"device{number}"), f"machine{number}", number)
            self.addCleanup(device.close)
            device.configure(f"urls = \"{self.cluster.urls}\"\nanswer_seconds = 1")
            device.start()
            self.devices.append(device)

    def record_and_wait(self):
        for device in self.devices:
            device.record(AT_ONCE)
        gone_on = eventually(lambda: all(device.cursor() == device.last for device in self.devices))
        self.assertTrue(gone_on, [device.logged()[-300:] for device in self.devices])

    def ids_in_stream(self):
        """By device's number, in the order in which they arrived."""
        found = {}
        with self.cluster.servers[0].client() as client:
            messages = client.all_messages()
        for _, message in messages:
            batch = batches.read(message)
            self.assertEqual((batch.gaps, batch.left_out), ([], 0))
            found.setdefault(batch.device, []).extend(batch.events)
        return found

    def test_while_one_is_gone_all_goes_on_and_nothing_is_missing_or_double(self):
        self.record_and_wait()
        # The one that leads the stream, then another one.
        leader = self.cluster.leader()
        for number in (leader, (leader + 1) % 3):
            self.cluster.servers[number].end()
            self.record_and_wait()
            self.cluster.servers[number].launch()
            self.cluster.until(self.cluster.is_whole, "come together again")
        self.record_and_wait()
        found = self.ids_in_stream()
        self.assertEqual(len(found), DEVICES)
        for ids in found.values():
            self.assertEqual(ids, list(range(1, 4 * AT_ONCE + 1)))

    def test_without_two_of_three_nothing_is_taken_and_nothing_lost(self):
        for server in self.cluster.servers[:2]:
            server.end()
        for device in self.devices:
            device.record(AT_ONCE)
        waiting = eventually(lambda: all("messages aren't taken: " in device.logged() for device in self.devices))
        self.assertTrue(waiting, [device.logged()[-300:] for device in self.devices])
        self.assertEqual({device.cursor() for device in self.devices}, {0})
        for server in self.cluster.servers[:2]:
            server.launch()
        self.cluster.until(self.cluster.is_whole, "come together again")
        self.record_and_wait()
        for ids in self.ids_in_stream().values():
            self.assertEqual(ids, list(range(1, 2 * AT_ONCE + 1)))


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
