# SPDX-License-Identifier: Apache-2.0
"""With the configuration that is there by default, tarnreporting-export opens no socket and writes no byte."""

import os
import re
import shutil
import sqlite3
import subprocess
import sys
import tempfile
import unittest

EXPORT = os.environ["EXPORT"]
SOCKETS = ("socket", "socketpair", "connect", "bind", "sendto", "sendmsg", "sendmmsg")
WRITES = ("write", "writev", "pwrite64", "pwritev", "pwritev2", "sendfile", "copy_file_range", "splice", "rename",
          "renameat", "renameat2", "unlink", "unlinkat", "mkdir", "mkdirat", "link", "linkat", "symlink", "symlinkat",
          "truncate", "ftruncate", "fallocate", "creat", "mknod", "mknodat", "io_uring_setup")
OPENS_TO_WRITE = re.compile(r"\bopen(?:at|at2)?\(.*\bO_(?:WRONLY|RDWR|CREAT|TRUNC)\b")
CALL = re.compile(r"^(?:\[pid +\d+\] |\d+ +)?(\w+)\(")


def store(path):
    """As much of one as shows that there would be something to send."""
    database = sqlite3.connect(path)
    database.executescript("""
        PRAGMA user_version = 0;
        CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT);
        INSERT INTO events VALUES(1, 1795158000, 'tally', 'sys.oxbow.tarnkit.Volume.Summary', '{"play_seconds":1}',
                                  '{}');
    """)
    database.commit()
    database.close()


def calls_in(trace):
    """(name, line) of each system call."""
    for line in trace.splitlines():
        found = CALL.match(line)
        if found:
            yield found.group(1), line


def forbidden(trace):
    return [line for name, line in calls_in(trace)
            if name in SOCKETS or name in WRITES or OPENS_TO_WRITE.search(line)]


@unittest.skipUnless(shutil.which("strace"), "strace is not installed here")
class Off(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarnoff")
        self.addCleanup(shutil.rmtree, self.folder)
        os.mkdir(os.path.join(self.folder, "state"))
        os.mkdir(os.path.join(self.folder, "own"))
        store(os.path.join(self.folder, "state", "recorder.sqlite3"))

    def traced(self, configuration, *words):
        path, trace = os.path.join(self.folder, "export.toml"), os.path.join(self.folder, "trace")
        with open(path, "w", encoding="utf-8") as file:
            file.write(configuration)
        done = subprocess.run(
            ["strace", "-f", "-o", trace, EXPORT, "--config", path, "--state-dir", os.path.join(self.folder, "state"),
             "--own-dir", os.path.join(self.folder, "own"), *words],
            capture_output=True, text=True, timeout=30, check=False)
        if not os.path.exists(trace) or "ptrace" in done.stderr:
            self.skipTest("nothing may be traced here")
        with open(trace, encoding="utf-8", errors="replace") as file:
            return done, file.read()

    def test_off_opens_no_socket_and_writes_no_byte(self):
        for configuration in ("", "[privacy]\nmode = \"off\"\n[server]\nurls = \"nats://127.0.0.1:1\"\n"):
            done, trace = self.traced(configuration)
            self.assertEqual((done.returncode, done.stdout, done.stderr), (0, "", ""))
            self.assertGreater(len(list(calls_in(trace))), 20, trace)
            self.assertEqual(forbidden(trace), [])
        self.assertEqual(os.listdir(os.path.join(self.folder, "own")), [])
        self.assertEqual(os.listdir(os.path.join(self.folder, "state")), ["recorder.sqlite3"])

    def test_what_is_looked_for_is_found_where_it_is(self):
        done, trace = self.traced("[privacy]\nmode = \"of\"\n")
        self.assertEqual(done.returncode, 78)
        self.assertEqual([line.split("(")[0].split()[-1] for line in forbidden(trace)], ["write"])


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
