# SPDX-License-Identifier: Apache-2.0
"""tarnreporting-collect with a real stream and a real database, while each of them is killed: 0 missing, 0 double."""

import os
import random
import signal
import subprocess
import sys
import time
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
sys.path.insert(0, os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..", "campaigns"))
import nats  # noqa: E402
from collecting import PRODUCER, Collecting  # noqa: E402
from smalldisk import SmallDisk, fill  # noqa: E402

SEED = int(os.environ.get("TARN_TEST_SEED", "1"))
DISK_BYTES = 192 << 20
CONSUMER = "$JS.API.CONSUMER.INFO.TARNREPORTING.collect"


@unittest.skipUnless(nats.PROGRAM, "nats-server is not installed here")
class Streaming(Collecting):
    def setUp(self):
        super().setUp()
        self.server = nats.Server(self.folder)
        self.server.start()
        self.addCleanup(self.server.end)
        self.configure(server={"urls": self.server.url}, database={"url": self.database.url, "group_messages": 16})
        with nats.Client(self.server.port) as client:
            client.make_stream()
        self.collectors = []
        self.log = open(os.path.join(self.folder, "collect.log"), "ab")
        self.addCleanup(self.log.close)
        self.addCleanup(lambda: [self.end(each, signal.SIGKILL) for each in self.collectors])

    def start(self):
        self.collectors.append(subprocess.Popen(self.command(), stderr=self.log))
        return self.collectors[-1]

    @staticmethod
    def end(collector, how=signal.SIGTERM):
        collector.send_signal(how)
        return collector.wait()

    def said(self):
        with open(self.log.name, encoding="utf-8") as file:
            return file.read()

    def send(self, *arguments):
        sender = subprocess.Popen([PRODUCER, "--url", self.server.url, *map(str, arguments)], stdout=subprocess.PIPE)
        self.addCleanup(sender.stdout.close)
        return sender

    def truth(self, sender):
        import json
        text = sender.communicate()[0]
        self.assertEqual(sender.returncode, 0)
        return json.loads(text)

    def drain(self, patience=120):
        """Until everything in the stream was acknowledged; what is left then."""
        until = time.monotonic() + patience
        left = None
        while time.monotonic() < until:
            try:
                with nats.Client(self.server.port) as client:
                    state = client.ask(CONSUMER)
                left = (state["num_pending"], state["num_ack_pending"])
                if left == (0, 0):
                    return left
            except (OSError, RuntimeError, TimeoutError):
                pass
            time.sleep(0.1)
        return left

    def eventually(self, holds, patience=60):
        until = time.monotonic() + patience
        while not holds() and time.monotonic() < until:
            time.sleep(0.1)
        self.assertTrue(holds(), self.said())


class Stream(Streaming):
    def test_what_was_sent_is_stored_once_by_three_side_by_side(self):
        for _ in range(3):
            self.start()
        truth = self.truth(self.send("--devices", 20, "--ids", 2000, "--repeat", 0.3, "--seed", SEED))
        self.assertEqual(self.drain(), (0, 0), self.said())
        self.assert_even(truth)
        self.assert_hours_by_key()
        self.assertEqual([self.end(each) for each in self.collectors], [0, 0, 0])

    def test_once_ends_when_nothing_waits(self):
        truth = self.truth(self.send("--devices", 3, "--ids", 1000, "--seed", SEED))
        self.collect("--once")
        self.assert_even(truth)

    def test_kills_of_collectors_server_and_database_leave_nothing_out_and_nothing_twice(self):
        dice = random.Random(SEED)
        for _ in range(3):
            self.start()
        sender = self.send("--devices", 60, "--ids", 4000, "--batch", 100, "--repeat", 0.2, "--seed", SEED)
        kills = {"collector": 0, "server": 0, "database": 0}
        until = time.monotonic() + 60
        while time.monotonic() < until and (sender.poll() is None or min(kills.values()) < 3):
            time.sleep(dice.uniform(0.2, 1))
            victim = dice.choice(("collector", "collector", "server", "database"))
            kills[victim] += 1
            if victim == "collector":
                which = dice.randrange(len(self.collectors))
                self.end(self.collectors.pop(which), signal.SIGKILL)
                self.start()
            elif victim == "server":
                self.server.end()
                time.sleep(dice.uniform(0, 1))
                self.server.start()
            else:
                self.database.end(dice.choice((signal.SIGKILL, signal.SIGINT)))
                time.sleep(dice.uniform(0, 1))
                self.database.start()
        truth = self.truth(sender)
        self.assertEqual(self.drain(), (0, 0), self.said())
        self.assert_even(truth)
        self.assert_hours_by_key()
        self.assertGreaterEqual(min(kills.values()), 3, kills)
        print(f"seed {SEED}: {truth['events']} events through {kills}", file=sys.stderr)

    def test_nothing_is_acknowledged_while_there_is_no_database(self):
        self.database.end()
        collector = self.start()
        self.eventually(lambda: "database: " in self.said())
        truth = self.truth(self.send("--devices", 3, "--ids", 1000, "--seed", SEED))
        time.sleep(1)
        self.database.start()
        self.assertEqual(self.drain(), (0, 0), self.said())
        self.assert_even(truth)
        self.assertIn("the database takes it again, after", self.said())
        self.assertEqual(self.end(collector), 0)

    def test_a_database_that_goes_while_a_group_is_held_gets_it_later(self):
        collector = self.start()
        self.eventually(lambda: self.database.ask("SELECT to_regclass('refused')") == [["refused"]])
        self.database.ask("ALTER TABLE told RENAME TO hidden")
        truth = self.truth(self.send("--devices", 3, "--ids", 1000, "--seed", SEED))
        self.eventually(lambda: "told" in self.said())
        with nats.Client(self.server.port) as client:
            self.assertEqual(client.ask(CONSUMER)["ack_floor"]["stream_seq"], 0)
        self.assertEqual(self.database.number("SELECT count(*) FROM events"), 0)
        self.database.ask("ALTER TABLE hidden RENAME TO told")
        self.assertEqual(self.drain(), (0, 0), self.said())
        self.assert_even(truth)
        self.assertEqual(self.said().count('relation "told" does not exist'), 1)
        self.assertEqual(self.end(collector), 0)

    def test_a_group_that_was_not_written_is_given_back_at_the_end(self):
        collector = self.start()
        self.eventually(lambda: self.database.ask("SELECT to_regclass('refused')") == [["refused"]])
        self.database.ask("ALTER TABLE told RENAME TO hidden")
        truth = self.truth(self.send("--devices", 3, "--ids", 1000, "--seed", SEED))
        self.eventually(lambda: "told" in self.said())
        self.assertEqual(self.end(collector), 0)
        self.database.ask("ALTER TABLE hidden RENAME TO told")
        # At once, and not only when the server's patience is over.
        self.start()
        self.assertEqual(self.drain(patience=15), (0, 0), self.said())
        self.assert_even(truth)

    def test_what_a_killed_one_held_goes_to_another_after_answer_seconds(self):
        self.configure(server={"urls": self.server.url, "answer_seconds": 2})
        collector = self.start()
        self.eventually(lambda: self.database.ask("SELECT to_regclass('refused')") == [["refused"]])
        self.database.ask("ALTER TABLE told RENAME TO hidden")
        truth = self.truth(self.send("--devices", 3, "--ids", 1000, "--seed", SEED))
        self.eventually(lambda: "told" in self.said())
        self.end(collector, signal.SIGKILL)
        self.database.ask("ALTER TABLE hidden RENAME TO told")
        self.start()
        self.assertEqual(self.drain(patience=15), (0, 0), self.said())
        self.assert_even(truth)

    def test_what_nothing_can_be_made_of_does_not_come_again(self):
        self.start()
        truth = self.truth(self.send("--devices", 2, "--ids", 600, "--seed", SEED, "--odd"))
        self.assertEqual(self.drain(), (0, 0), self.said())
        self.assertEqual(self.database.number(
            "SELECT count(*) FROM refused WHERE stream = 'TARNREPORTING' AND sequence > 0"), 2)
        self.assertEqual(self.said().count("refused: "), 2)
        self.assertEqual(self.database.number("SELECT count(*) FROM events"), truth["events"] + 1)

    def test_a_stream_that_is_not_there_yet_is_waited_for(self):
        with nats.Client(self.server.port) as client:
            client.ask("$JS.API.STREAM.DELETE.TARNREPORTING")
        self.start()
        self.eventually(lambda: "TARNREPORTING: " in self.said())
        with nats.Client(self.server.port) as client:
            client.make_stream()
        truth = self.truth(self.send("--devices", 2, "--ids", 600, "--seed", SEED))
        self.assertEqual(self.drain(), (0, 0), self.said())
        self.assert_even(truth)

    def test_days_beyond_retention_are_dropped_when_it_is_due(self):
        truth = self.truth(self.send("--devices", 6, "--ids", 1000, "--seed", SEED, "--begin",
                                     int(time.time()) - 5 * 86400))
        self.collect("--once")
        before, old = self.account(), "SELECT count(*) FROM events WHERE time::date < current_date - 4"
        self.assertGreater(self.database.number(old), 0)
        self.configure(server={"urls": self.server.url}, retention={"days": 4})
        self.assertIn("days dropped", self.collect("--once"))
        self.assertEqual(self.database.number(old), 0)
        self.assertGreater(self.database.number("SELECT count(*) FROM events"), 0)
        self.assertEqual(self.account(), before)
        self.assert_hours(truth)

    def test_wrong_settings_end_it(self):
        self.configure(retention={"days": "many"})
        self.assertIn("collect.toml:4: ", self.collect(status=78))
        self.configure(server={"authority_file": os.path.join(self.folder, "none")})
        self.collect(status=1)
        self.collect("--no-such-option", status=64)


class FullDisk(Streaming):
    """The database's disk has no room for a while."""

    def place_of_database(self):
        os.chmod(self.folder, 0o755)  # who runs the database is another
        self.disk = os.path.join(self.folder, "disk")
        small = SmallDisk()
        if not small.mount(self.disk, DISK_BYTES):
            self.skipTest("no file system can be mounted here")
        self.addCleanup(small.unmount, self.disk)
        return self.disk

    def test_what_came_meanwhile_is_stored_once_there_is_room_and_nothing_was_acknowledged_before(self):
        collector = self.start()
        self.eventually(lambda: self.database.ask("SELECT to_regclass('refused')") == [["refused"]])
        fill(os.path.join(self.disk, "filler"))
        truth = self.truth(self.send("--devices", 20, "--ids", 2000, "--seed", SEED))
        self.eventually(lambda: "No space left on device" in self.said())
        with nats.Client(self.server.port) as client:
            state = client.ask(CONSUMER)
        self.assertGreater(state["num_pending"] + state["num_ack_pending"], 0)
        os.unlink(os.path.join(self.disk, "filler"))
        self.assertEqual(self.drain(), (0, 0), self.said())
        self.assert_even(truth)
        # Told once, not at every try.
        self.assertEqual(self.said().count("No space left on device"), 1, self.said())
        self.assertIn("the database takes it again, after", self.said())
        self.assertEqual(self.end(collector), 0)


if __name__ == "__main__":
    unittest.main()
