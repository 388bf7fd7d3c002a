# SPDX-License-Identifier: Apache-2.0
"""tarnreporting-export at a server that knows its users by credentials files, and what is told when it doesn't."""

import os
import shutil
import sys
import tempfile
import time
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import nats  # noqa: E402
from credentials import Operator, login_of  # noqa: E402
from exporting import Device, eventually  # noqa: E402

EXPORT = os.environ["EXPORT"]
REFUSED = "tarnreporting-export: messages aren't taken: "
# All that it does there.
PUBLISHES, SUBSCRIBES = ("tarnreporting.>",), ("_INBOX.>", "tarnreporting-again.>")


@unittest.skipUnless(nats.PROGRAM, "nats-server is not installed here")
@unittest.skipUnless(shutil.which("openssl"), "openssl is not installed here")
class Credentials(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarncredentials")
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.operator = Operator(self.folder)
        self.server = nats.Server(os.path.join(self.folder, "server"), self.operator.configuration(),
                                  login=login_of(self.operator.user("keeper")))
        self.addCleanup(self.server.end)
        self.server.start()
        with self.server.client() as client:
            client.make_stream()
        self.file = os.path.join(self.folder, "device.creds")
        self.device = Device(EXPORT, os.path.join(self.folder, "device"))
        self.addCleanup(self.device.close)
        self.device.record(100)

    def start(self):
        self.device.configure(f"urls = \"{self.server.url}\"\ncredentials_file = \"{self.file}\"\n")
        self.device.start()

    def told(self):
        self.assertTrue(eventually(lambda: REFUSED in self.device.logged()), self.device.logged())
        self.assertEqual(self.device.cursor(), 0)
        return self.device.logged()

    def make(self, **rights):
        self.operator.credentials(self.file, "device", **{"publishes": PUBLISHES, "subscribes": SUBSCRIBES, **rights})

    def assert_taken(self):
        self.assertTrue(eventually(lambda: self.device.cursor() == 100), self.device.logged())

    def test_with_no_rights_but_its_own_all_arrives(self):
        self.make()
        self.start()
        self.assert_taken()

    def test_without_a_file_it_is_told_and_taken_once_there_is_one(self):
        self.start()
        self.assertIn(self.file, self.told())
        self.make()
        self.assert_taken()
        self.assertIn("messages are taken again", self.device.logged())

    def test_of_another_operator_it_is_refused(self):
        another = os.path.join(self.folder, "another")
        os.mkdir(another)
        Operator(another).credentials(self.file, "device")
        self.start()
        self.assertIn("Authorization Violation", self.told())

    def test_that_have_ended_are_refused_and_renewed_ones_taken(self):
        self.make(ends=time.time() - 60)
        self.start()
        self.told()
        self.make()
        self.assert_taken()

    def test_without_the_right_to_publish_nothing_counts_as_arrived(self):
        self.make(publishes=("another.>",))
        self.start()
        self.told()

    def test_that_are_no_credentials_are_named(self):
        with open(self.file, "w", encoding="utf-8") as file:
            file.write("nothing of the kind\n")
        self.start()
        self.assertIn(self.file, self.told())


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
