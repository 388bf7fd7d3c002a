# SPDX-License-Identifier: Apache-2.0
"""The package as it lies in the tree, and a real service for the tests that want one."""

import json
import os
import shutil
import subprocess
import sys
import tempfile
import time
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
ROOT = os.path.dirname(os.path.dirname(os.path.dirname(HERE)))
PACKAGE = os.path.join(ROOT, "clients", "python")
sys.path.insert(0, PACKAGE)
PATIENCE = 60


def eventually(holds):
    """Whether it came to hold in time."""
    deadline = time.monotonic() + PATIENCE
    while not holds():
        if time.monotonic() > deadline:
            return False
        time.sleep(0.01)
    return True


class Folder(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarnpython")
        self.addCleanup(shutil.rmtree, self.folder)
        self.socket = os.path.join(self.folder, "socket")

    def run_python(self, text, **environment):
        """Runs a program with the package; what became of it."""
        return subprocess.run([sys.executable, "-B", "-X", "dev", "-c", text], capture_output=True, text=True,
                              stdin=subprocess.DEVNULL, timeout=PATIENCE,
                              env={**os.environ, "PYTHONPATH": PACKAGE, "SOCKET": self.socket, **environment})


class WithService(Folder):
    """Starts the programs that TARNREPORTINGD and TARNREPORTINGCTL name."""

    def setUp(self):
        super().setUp()
        self.service = None
        self.addCleanup(self.stop)

    def start(self):
        self.service = subprocess.Popen(
            [os.environ["TARNREPORTINGD"], "--socket", self.socket, "--state-dir", os.path.join(self.folder, "state"),
             "--log-level", "error"], stdin=subprocess.DEVNULL)
        self.assertTrue(eventually(lambda: self.ctl("status").returncode == 0))

    def stop(self):
        if self.service is not None:
            self.service.kill()
            self.service.wait()

    def ctl(self, *words):
        return subprocess.run([os.environ["TARNREPORTINGCTL"], "--socket", self.socket, "--state-dir",
                               os.path.join(self.folder, "state"), *words], capture_output=True, text=True,
                              stdin=subprocess.DEVNULL, timeout=PATIENCE)

    def events(self, name):
        """The payloads of what is recorded under this name by now."""
        lines = self.ctl("events", "--json").stdout.splitlines()
        return [event["payload"] for event in map(json.loads, lines)
                if event["name"] == "sys.oxbow.tarnkit." + name]

    def events_once_there_are(self, count, name):
        self.assertTrue(eventually(lambda: len(self.events(name)) >= count), self.events(name))
        return self.events(name)
