# SPDX-License-Identifier: Apache-2.0
"""A stream that loses what it had acknowledged: the collector misses it, asks the devices, and gets it from them."""

import os
import re
import signal
import subprocess
import sys
import time
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
sys.path.insert(0, os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
import nats  # noqa: E402
from collecting import Collecting  # noqa: E402
from exporting import Device, eventually  # noqa: E402

EXPORT = os.environ["EXPORT"]
PATIENCE = 100  # a device waits half a minute before it says how far it is


@unittest.skipUnless(nats.PROGRAM, "nats-server is not installed here")
class Again(Collecting):
    def setUp(self):
        super().setUp()
        self.server = nats.Server(os.path.join(self.folder, "server"))
        self.server.start()
        self.addCleanup(self.server.end)
        with self.server.client() as client:
            client.make_stream()
        self.configure(server={"urls": self.server.url, "again_seconds": 1}, database={"url": self.database.url})
        self.log = open(os.path.join(self.folder, "collect.log"), "ab")
        self.addCleanup(self.log.close)
        self.devices = []

    def device(self):
        number = len(self.devices)
        device = Device(EXPORT, os.path.join(self.folder, f"device{number}"), f"{number:032x}", number)
        self.addCleanup(device.close)
        device.configure(f"urls = \"{self.server.url}\"")
        device.start()
        self.devices.append(device)
        return device

    def tell(self, device, count):
        """The sequence numbers of what it sends of so many more events."""
        before = self.last_sequence()
        device.record(count)
        self.assertTrue(eventually(lambda: device.cursor() == device.last), device.logged())
        return range(before + 1, self.last_sequence() + 1)

    def last_sequence(self):
        with self.server.client() as client:
            return client.ask("$JS.API.STREAM.INFO.TARNREPORTING")["state"]["last_seq"]

    def lose(self, sequences):
        with self.server.client() as client:
            for each in sequences:
                client.ask("$JS.API.STREAM.MSG.DELETE.TARNREPORTING", {"seq": each})

    def start(self):
        collector = subprocess.Popen(self.command(), stderr=self.log)
        self.addCleanup(lambda: (collector.kill(), collector.wait()))
        self.assertTrue(eventually(
            lambda: self.database.ask("SELECT to_regclass('stored_parts')") == [["stored_parts"]]), self.said())
        return collector

    def said(self):
        with open(self.log.name, encoding="utf-8") as file:
            return file.read()

    def asked(self):
        return sum(int(count) for count in re.findall(r"asked for (\d+) ids again", self.said()))

    def test_what_is_lost_in_the_middle_and_at_the_end_comes_from_the_device_and_what_it_has_not_is_a_gap(self):
        middle, end, gone = (self.device() for _ in range(3))
        for device in self.devices:
            self.tell(device, 100)
        lost = [*self.tell(middle, 3000), *self.tell(gone, 50)]
        with gone.store:
            gone.store.execute("DELETE FROM event_rows WHERE id BETWEEN 111 AND 130")
        for device in self.devices:
            last = self.tell(device, 100)
        lost += self.tell(end, 70)
        self.lose(lost)
        self.assertGreater(len(lost), 3)
        collector = self.start()
        self.assertTrue(eventually(lambda: self.account()["made"] == sum(device.last for device in self.devices)
                                   and self.account()["untold"] == 0, PATIENCE), f"{self.account()} {self.said()}")
        made = sum(device.last for device in self.devices)
        self.assertEqual(self.account(), {"made": made, "stored": made - 20, "gaps": 20, "left_out": 0, "missing": 0,
                                          "untold": 0, "records": made - 20})
        self.assert_counts()
        self.assertEqual(self.database.ask(
            "SELECT payload ->> 'session_duration', count(*), sum(id), sum((payload ->> 'play_seconds')::bigint) "
            "FROM events GROUP BY 1 ORDER BY 1"),
            [[str(device.number), str(len(ids)), *[str(sum(ids))] * 2] for device in self.devices
             for ids in [[each for each in range(1, device.last + 1)
                          if device is not gone or not 111 <= each <= 130]]])
        self.assertEqual(len(last), 1)
        # What is there isn't asked for any more.
        before = self.asked()
        self.assertGreaterEqual(before, 3000 + 50 + 70)
        time.sleep(4)
        self.assertEqual(self.asked(), before, self.said())
        self.assertIn(" ids were asked for again", middle.logged())
        collector.send_signal(signal.SIGTERM)
        self.assertEqual(collector.wait(), 0, self.said())

    def test_ranges_that_were_told_of_are_joined_and_say_the_same(self):
        device = self.device()
        for _ in range(5):
            self.tell(device, 10)
        self.start()
        self.assertTrue(eventually(lambda: self.database.ask("SELECT first, last FROM told") == [["1", "50"]]),
                        self.database.ask("SELECT * FROM told"))
        self.assertEqual(self.account()["stored"], 50)
        self.tell(device, 10)
        self.assertTrue(eventually(lambda: self.database.ask("SELECT first, last FROM told") == [["1", "60"]]),
                        self.database.ask("SELECT * FROM told"))
        self.assertEqual(self.asked(), 0)


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
