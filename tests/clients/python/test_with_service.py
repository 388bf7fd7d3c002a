# SPDX-License-Identifier: Apache-2.0
"""The package with the real service: what is posted is recorded."""

import logging
import threading
import time
import unittest

from support import WithService, eventually

import tarnreporting
from tarnreporting import Category, Key, ServiceType, Type

ADDED = ("tarnreporting_timestamp", "audiotag", "HostApplicationDisplayID")


class Recorded(WithService):
    def test_messages_arrive_with_their_values_and_their_application(self):
        self.start()
        with tarnreporting.Client(self.socket) as client:
            with client.session(ServiceType.LONG_FORM_AUDIO, "org.example.player") as session:
                fields = {"text": "caf\u00e9", "number": 0.25, "count": -7, "on": True, Key.ACTIVE_DEVICES: "Speaker"}
                self.assertTrue(session.post(Category.PLAYBACK, Type.GENERIC, fields, stamp=int(time.time()) - 100.5))
            self.assertTrue(eventually(lambda: client.stats().committed == 1))
            self.assertTrue(client.stats().connected)
            self.assertEqual(client.close(), 0)
        [payload] = self.events_once_there_are(1, "Playback.Generic")
        self.assertEqual(payload["HostApplicationDisplayID"], "org.example.player")
        self.assertEqual(payload["tarnreporting_timestamp"] % 1, 0.5)
        self.assertEqual({key: value for key, value in payload.items() if key not in ADDED}, fields)

    def test_a_player_that_knows_no_key_gets_its_volume_summary(self):
        self.start()
        with tarnreporting.Client(self.socket) as client:
            with client.session(ServiceType.LONG_FORM_AUDIO, "org.example.player") as session:
                now = time.time()
                session.output_running(0.5, "Speaker", stamp=now)
                session.output_stopped(stamp=now + 1.25)
            [summary] = self.events_once_there_are(1, "Volume.Summary")
        self.assertEqual((summary["KvSessionVolume"], summary["active_devices"]), (0.5, "Speaker"))
        self.assertAlmostEqual(summary["play_seconds"], 1.25, 3)

    def test_nothing_that_threads_posted_is_lost_over_a_restart(self):
        self.start()
        with tarnreporting.Client(self.socket) as client:
            session = client.session(ServiceType.TEST, "org.example.threads")
            shape = session.shape(Category.PLAYBACK, Type.START, {"number": int})

            def post(first):
                for number in range(first, first + 100):
                    self.assertTrue(shape.post(number))

            def from_threads(first):
                threads = [threading.Thread(target=post, args=(first + 100 * i,)) for i in range(4)]
                for thread in threads:
                    thread.start()
                for thread in threads:
                    thread.join()

            from_threads(0)
            self.assertTrue(eventually(lambda: client.stats().committed == 400))
            self.stop()
            from_threads(400)
            self.start()
            numbers = [payload["number"] for payload in self.events_once_there_are(800, "Playback.Start")]
            self.assertEqual(sorted(numbers), list(range(800)))
            self.assertEqual(client.close(20), 0)

    def test_a_refusal_goes_to_the_logger(self):
        self.start()
        with self.assertLogs("tarnreporting", logging.WARNING) as logged:
            with tarnreporting.Client(self.socket) as client:
                client.session(configuration={" a": 1, "_a": 2})  # blanks become _
                client.session(configuration={"HostApplicationDisplayID": "one"}, application="two")
                self.assertTrue(eventually(lambda: client.stats().refused > 0))
        self.assertIn("setConfiguration: not a property list", logged.output[0])


if __name__ == "__main__":
    unittest.main()
