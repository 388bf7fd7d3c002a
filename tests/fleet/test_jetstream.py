# SPDX-License-Identifier: Apache-2.0
"""tarnreporting-export with a real server: what arrives, and what becomes of it when the server doesn't take it."""

import os
import random
import re
import shutil
import signal
import socket
import sys
import tempfile
import time
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import nats  # noqa: E402
from exporting import RECORDED, Device, eventually  # noqa: E402
from proxy import Proxy  # noqa: E402

EXPORT = os.environ["EXPORT"]
MESSAGE_ID = re.compile(r"Nats-Msg-Id: *([0-9a-f]{32})\.(\d+)-(\d+)\.[0-9a-f]{32}")


@unittest.skipUnless(nats.PROGRAM, "nats-server is not installed here")
class JetStream(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarnjetstream")
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.device = Device(EXPORT, os.path.join(self.folder, "device"))
        self.addCleanup(self.device.close)
        self.server = nats.Server(self.folder)
        self.addCleanup(self.server.end)
        self.device.configure(f"urls = \"{self.server.url}\"")

    def arrived(self):
        """The ranges of ids of the stream's messages, in their order."""
        with self.server.client() as client:
            found = [MESSAGE_ID.search(client.message(number + 1)[0]) for number in range(client.messages())]
        return [(int(each[2]), int(each[3])) for each in found]

    def make_stream(self, **options):
        with self.server.client() as client:
            client.make_stream(**options)

    def test_what_is_recorded_arrives_once_and_the_program_goes_on_where_it_was(self):
        self.server.start()
        self.make_stream()
        self.device.record(5000)
        self.assertEqual(self.device.start("--once").wait(30), 0, self.device.logged())
        ranges = self.arrived()
        self.assertEqual([first for first, _ in ranges], [1] + [last + 1 for _, last in ranges[:-1]])
        self.assertEqual(ranges[-1][1], 5000)
        self.assertEqual(self.device.cursor(), 5000)
        self.device.record(10)
        self.assertEqual(self.device.start("--once").wait(30), 0, self.device.logged())
        self.assertEqual(self.arrived(), [*ranges, (5001, 5010)])

    def test_a_message_that_comes_again_is_dropped_by_its_id(self):
        self.server.start()
        self.make_stream()
        self.device.record(3000)
        self.assertEqual(self.device.start("--once").wait(30), 0)
        ranges = self.arrived()
        os.unlink(os.path.join(self.device.own, "cursor"))
        self.assertEqual(self.device.start("--once").wait(30), 0)
        self.assertEqual(self.arrived(), ranges)

    def test_a_server_that_comes_later_and_is_killed_misses_nothing(self):
        self.device.record(100)
        process = self.device.start()
        self.assertTrue(eventually(lambda: "messages aren't taken: " in self.device.logged()))
        self.server.start()
        self.make_stream()
        self.assertTrue(eventually(lambda: self.device.cursor() == 100), self.device.logged())
        self.server.end()
        self.device.record(100)
        again = eventually(lambda: self.device.logged().count("messages aren't taken: ") >= 2)
        self.assertTrue(again, self.device.logged())
        self.server.start()
        self.assertTrue(eventually(lambda: self.device.cursor() == 200), self.device.logged())
        self.assertIn("messages are taken again, after ", self.device.logged())
        process.send_signal(signal.SIGTERM)
        self.assertEqual(process.wait(10), 0)
        self.assertEqual(self.arrived()[-1][1], 200)

    def test_one_that_is_killed_again_and_again_leaves_nothing_out(self):
        self.server.start()
        self.make_stream()
        for _ in range(20):
            process = self.device.start()
            self.device.record(300)
            time.sleep(random.uniform(0, 0.15))
            process.kill()
            process.wait()
        self.assertEqual(self.device.start("--once").wait(30), 0, self.device.logged())
        self.assertEqual({each for first, last in self.arrived() for each in range(first, last + 1)},
                         set(range(1, 6001)))

    def test_a_stream_that_is_not_there_or_full_is_waited_for(self):
        self.server.start()
        self.device.record(100)
        self.device.start()
        self.assertTrue(eventually(lambda: "messages aren't taken: " in self.device.logged()), self.device.logged())
        self.make_stream(max_msgs=1)
        self.assertTrue(eventually(lambda: self.device.cursor() == 100), self.device.logged())
        self.device.record(100)
        self.assertTrue(eventually(lambda: "maximum messages exceeded" in self.device.logged()), self.device.logged())
        self.assertEqual(self.device.cursor(), 100)
        with self.server.client() as client:
            client.change_stream(max_msgs=-1)
        self.assertTrue(eventually(lambda: self.device.cursor() == 200), self.device.logged())

    def test_a_message_that_is_known_and_not_there_has_not_arrived(self):
        self.server.start()
        self.make_stream()
        proxy = Proxy(self.server.port, 1, known=1.0)
        self.addCleanup(proxy.close)
        self.device.configure(f"urls = \"nats://127.0.0.1:{proxy.port}\"")
        self.device.record(100)
        self.device.start()
        self.assertTrue(eventually(lambda: "messages aren't taken: " in self.device.logged()), self.device.logged())
        self.assertIn("knows the message and doesn't have it", self.device.logged())
        self.assertEqual(self.device.cursor(), 0)
        proxy.known = 0.0
        self.assertTrue(eventually(lambda: self.device.cursor() == 100), self.device.logged())
        self.assertEqual(self.arrived(), [(1, 100)])

    def test_status_tells_how_far_it_is_and_what_went_wrong(self):
        self.device.record(100)
        self.assertEqual(self.device.status().keys(), {"kind", "mode", "running", "arrived", "queue_seconds"})
        self.assertFalse(self.device.status()["running"])
        begun = time.time()
        process = self.device.start()
        self.assertTrue(eventually(lambda: "last_error" in self.device.status()))
        status = self.device.status()
        self.assertEqual((status["mode"], status["running"], status["arrived"]), ("export", True, 0))
        self.assertAlmostEqual(status["queue_seconds"], max(0, time.time() - RECORDED), delta=5)
        self.assertIn(f"127.0.0.1:{self.server.port}: ", status["last_error"])
        self.assertAlmostEqual(status["last_error_time"], begun, delta=10)
        self.server.start()
        self.make_stream()
        self.assertTrue(eventually(lambda: self.device.cursor() == 100), self.device.logged())
        process.send_signal(signal.SIGTERM)
        self.assertEqual(process.wait(10), 0)
        status = self.device.status()
        self.assertEqual((status["running"], status["arrived"], status["queue_seconds"]), (False, 100, 0))
        self.assertGreaterEqual(status["last_success_time"], status["last_error_time"])
        self.device.configure("", mode="off")
        self.assertEqual(self.device.status(), {"kind": "status", "mode": "off"})

    def test_the_service_manager_is_told_when_that_changes(self):
        manager = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self.addCleanup(manager.close)
        manager.bind(os.path.join(self.folder, "notify"))
        manager.settimeout(20)
        self.device.start(NOTIFY_SOCKET=os.path.join(self.folder, "notify"))

        def told(text):
            until = time.monotonic() + 20
            while time.monotonic() < until:
                if text in manager.recv(4096).decode():
                    return True
            return False

        self.assertTrue(told("STATUS=up to event 0 all has arrived"))
        self.device.record(100)
        self.assertTrue(told("STATUS=up to event 0 all has arrived; messages aren't taken for "))
        self.server.start()
        self.make_stream()
        self.assertTrue(told("STATUS=up to event 100 all has arrived"))

    def test_settings_that_are_wrong_are_told_and_end_it(self):
        self.device.configure(f"urls = \"{self.server.url}\"\nauthority_file = \"{self.folder}/none\"")
        self.assertEqual(self.device.start().wait(10), 1)
        self.assertIn("/none: ", self.device.logged())
        self.device.configure("urls = \"nats://[\"")
        self.assertEqual(self.device.start().wait(10), 78)
        self.assertIn("\"server.urls\" must be addresses", self.device.logged())
        self.device.configure(f"urls = \"{self.server.url}\"")
        os.unlink(os.path.join(self.device.folder, "fleet.key"))
        self.assertEqual(self.device.start().wait(10), 78)
        self.assertIn("fleet.key: No such file or directory", self.device.logged())

    def test_local_keeps_messages_on_the_machine_and_needs_no_server(self):
        self.device.configure("", mode="local")
        self.device.record(100)
        self.assertEqual(self.device.start("--once").wait(30), 0, self.device.logged())
        [name] = os.listdir(os.path.join(self.device.own, "messages"))
        self.assertRegex(name, r"^[0-9a-f]{32}\.1-100\.[0-9a-f]{32}\.tnf$")
        self.assertEqual(self.device.cursor(), 100)

    def test_two_of_them_do_not_work_with_one_cursor(self):
        self.server.start()
        self.make_stream()
        self.device.record(1)
        self.device.start()
        self.assertTrue(eventually(lambda: self.device.cursor() == 1), self.device.logged())
        self.assertEqual(self.device.start("--once").wait(10), 1)
        self.assertIn("another one works with it", self.device.logged())


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
