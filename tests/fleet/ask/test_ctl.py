# SPDX-License-Identifier: Apache-2.0
"""`tarnreportingctl fleet` hands its words over as they are, to the program beside it or where the shell finds it."""

import os
import shutil
import subprocess
import tempfile
import unittest

ASK, CTL = os.environ["ASK"], os.environ["CTL"]
# Prints what it was run as.
SHOW = "#!/bin/sh\nprintf '%s\\n' \"$0\" \"$@\"\nexit 7\n"


class HandOver(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarnask")
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.alone = os.path.join(self.folder, "alone")
        self.path = os.path.join(self.folder, "path")
        os.mkdir(self.alone)
        os.mkdir(self.path)
        # The tool where nothing is beside it.
        self.tool = shutil.copy2(CTL, self.alone)

    def run_tool(self, *words, tool=None, **more):
        return subprocess.run([tool or self.tool, *words], capture_output=True, text=True, check=False, timeout=30,
                              env={"PATH": self.path, "LC_ALL": "C.UTF-8", **more})

    def put(self, folder):
        path = os.path.join(folder, "tarnreporting-fleet")
        with open(path, "w", encoding="utf-8") as file:
            file.write(SHOW)
        os.chmod(path, 0o755)
        return path

    def test_every_word_after_it_arrives_and_the_exit_status_is_the_others(self):
        self.put(self.path)
        words = ["--db", "host=a b=c", "top", "--since", "-1h", "--help", "-q", "", "--version", "sessions"]
        done = self.run_tool("fleet", *words)
        self.assertEqual(done.returncode, 7, done.stderr)
        told = done.stdout.splitlines()
        self.assertEqual(told[1:3], ["--color", "never"])
        self.assertEqual(told[3:], words)

    def test_what_was_said_before_it_of_the_output_counts(self):
        self.put(self.path)
        told = self.run_tool("-q", "--color", "always", "fleet", "top").stdout.splitlines()
        self.assertEqual(told[1:], ["--color", "always", "-q", "top"])

    def test_the_one_beside_it_goes_before_that_of_the_path(self):
        found = self.put(self.path)
        self.assertEqual(self.run_tool("fleet").stdout.splitlines()[0], found)
        beside = self.put(self.alone)
        self.assertEqual(self.run_tool("fleet").stdout.splitlines()[0], beside)

    def test_where_there_is_none_the_package_is_named(self):
        done = self.run_tool("fleet", "top")
        self.assertEqual((done.returncode, done.stdout), (69, ""))
        self.assertEqual(done.stderr, "tarnreportingctl: fleet needs tarnreporting-fleet, which the package "
                                      "tarnreporting-collect has\n")

    def test_one_that_cannot_be_run_is_told(self):
        os.chmod(self.put(self.path), 0o644)
        done = self.run_tool("fleet", "top")
        self.assertEqual(done.returncode, 69)
        self.assertIn("can't run tarnreporting-fleet: ", done.stderr)

    def test_the_real_one_answers_through_it(self):
        self.assertEqual(os.path.dirname(ASK), os.path.dirname(CTL))
        done = self.run_tool("fleet", "top", "--help", tool=CTL)
        self.assertEqual(done.returncode, 0, done.stderr)
        self.assertIn("tarnreporting-fleet top", done.stdout)
        done = self.run_tool("fleet", tool=CTL)
        self.assertEqual(done.returncode, 64)
        self.assertTrue(done.stderr.startswith("tarnreporting-fleet: "), done.stderr)
        done = self.run_tool("fleet", "top", "--db", f"host={self.folder}", tool=CTL)
        self.assertEqual(done.returncode, 69, done.stderr)


if __name__ == "__main__":
    unittest.main()
