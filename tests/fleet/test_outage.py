# SPDX-License-Identifier: Apache-2.0
"""A real service and the real tarnreporting-export over an outage that lasts longer than the service's cap: what hadn't
left goes last, what went all the same is counted, and the gaps that leave later are exactly that.
"""

import os
import shutil
import sqlite3
import sys
import tempfile
import time
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, HERE)
sys.path.insert(0, os.path.join(HERE, "..", "campaigns"))
import batches  # noqa: E402
import nats  # noqa: E402
import wire  # noqa: E402
from exporting import Device, eventually  # noqa: E402
from service import Service, settled  # noqa: E402

EXPORT, SERVICE = os.environ["EXPORT"], os.environ["SERVICE"]
REPORTER = 7


class ServedDevice(Device):
    """A device whose store is a service's."""

    def __init__(self, folder):
        super().__init__(EXPORT, folder)
        self.store.close()
        for name in os.listdir(self.state):
            os.unlink(os.path.join(self.state, name))
        self.service = Service(SERVICE, folder, "[recorder]\nmax_megabytes = 1\n"
                               f"[paths]\nexported = \"{self.own}/arrived\"\n")
        self.client, self.sent = None, 0

    def close(self):
        if self.client is not None:
            self.client.close()
        self.service.kill()
        super().close()

    def configure(self, server, mode="export"):
        self.write("export.toml", f"[privacy]\nmode = \"{mode}\"\nkey_file = \"{self.folder}/fleet.key\"\n"
                   f"others = [\"*\"]\n[server]\n{server}\n")

    def connect(self):
        if self.client is not None:
            self.client.close()
        self.client = self.service.connect()
        self.client.call(wire.CREATE, REPORTER)
        self.client.send(wire.START, REPORTER)

    def send(self, count):
        """Messages that are all different, and each of which leaves as two events."""
        for _ in range(count):
            self.sent += 1
            self.client.call(wire.SEND, {"number": self.sent, "text": 2000 * "x"}, wire.PLAYBACK, wire.PLAYBACK_START,
                             [REPORTER])
        settled(self.client)

    def ids(self):
        with sqlite3.connect(f"file:{self.service.store}?mode=ro", uri=True, timeout=10) as store:
            return {row[0] for row in store.execute("SELECT id FROM event_rows")}

    def ledger(self):
        """The status once retention is done with what there is."""
        while True:
            before = self.client.call(wire.STATUS)["recorder_expired"]
            time.sleep(0.2)
            status = self.client.call(wire.STATUS)
            if status["recorder_expired"] == before:
                return status


@unittest.skipUnless(nats.PROGRAM, "nats-server is not installed here")
class Outage(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarnoutage")
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.device = ServedDevice(os.path.join(self.folder, "device"))
        self.addCleanup(self.device.close)
        self.server = nats.Server(self.folder)
        self.addCleanup(self.server.end)
        self.device.configure(f"urls = \"{self.server.url}\"")
        self.assertTrue(self.device.service.start(), self.device.service.log_text())
        self.device.connect()

    def told_of(self):
        """(ids of events, ids in gaps) that the stream's messages tell of."""
        events, gaps = set(), set()
        with self.server.client() as client:
            for number in range(client.messages()):
                batch = batches.read(client.message(number + 1)[1])
                events.update(batch.events)
                for first, last in batch.gaps:
                    gaps.update(range(first, last + 1))
                self.assertEqual(batch.left_out, 0)
        return events, gaps

    def bring_up(self):
        self.server.start()
        with self.server.client() as client:
            client.make_stream()

    def all_has_left(self):
        last = max(self.device.ids())
        return eventually(lambda: self.device.cursor() == last)

    def test_what_goes_in_an_outage_longer_than_the_cap_is_what_the_gaps_say(self):
        self.bring_up()
        self.device.start()
        for _ in range(8):
            self.device.send(25)
            self.assertTrue(self.all_has_left(), self.device.logged())
        left = self.device.cursor()
        self.server.end()

        self.device.send(60)
        self.assertGreater(self.device.ledger()["recorder_expired"], 0)
        # What has left goes first: as long as there is any of it, nothing else goes. How much goes is the log's size to
        # say, which is another on a busy machine.
        unexported, kept = self.device.ledger()["recorder_expired_unexported"]["count"], self.device.ids()
        self.assertEqual(unexported, len(set(range(left + 1, max(kept) + 1)) - kept))
        self.assertTrue(unexported == 0 or min(kept) > left, f"{unexported} went, and {min(kept)} is there still")

        self.device.send(1500)
        counted = self.device.ledger()["recorder_expired_unexported"]
        kept = self.device.ids()
        gone = set(range(left + 1, max(kept) + 1)) - kept
        self.assertEqual(counted, {"count": len(gone), "first": min(gone), "last": max(gone)})
        self.assertIn(" events that hadn't been exported: ", self.device.service.log_text())

        # What it had read before it went would leave still; one that is killed knows the store alone.
        for process in self.device.processes:
            process.kill()
            process.wait()
        self.device.start()
        self.server.start()
        self.assertTrue(self.all_has_left(), self.device.logged())
        events, gaps = self.told_of()
        self.assertEqual(gaps, gone)
        self.assertEqual(events | gaps, set(range(1, max(kept) + 1)))
        self.assertEqual(events & gaps, set())
        self.assertEqual(events, set(range(1, left + 1)) | {each for each in kept if each > left})

    def test_a_service_that_is_killed_in_the_outage_changes_nothing(self):
        self.bring_up()
        self.device.start()
        self.device.send(50)
        self.assertTrue(self.all_has_left(), self.device.logged())
        self.server.end()
        for _ in range(3):
            self.device.send(500)
            self.device.service.kill()
            self.assertTrue(self.device.service.start(), self.device.service.log_text())
            self.device.connect()
        self.device.ledger()
        kept = self.device.ids()
        self.server.start()
        self.assertTrue(self.all_has_left(), self.device.logged())
        events, gaps = self.told_of()
        self.assertEqual(events | gaps, set(range(1, max(self.device.ids()) + 1)))
        self.assertEqual(events & gaps, set())
        self.assertLessEqual(kept, events)
        self.assertGreater(len(gaps), 0)  # what the exporter had read already leaves still


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
