# SPDX-License-Identifier: Apache-2.0
"""Programs that post to rings, and the rings themselves as anybody can see them who may look at the program's memory
files."""

import mmap
import os
import struct
import subprocess
import sys
import time
from collections import Counter

from account import FIRST, rows_after
from service import PATIENCE, end_with_parent

HEADER_BYTES = 4096
MAGIC = b"TARNRING"
POSTED, DROPPED, TAKEN_MESSAGES, COMMITTED_MESSAGES = 72, 80, 144, 152


class Program:
    """A program with rings that posts numbered messages, of one key from each ring, until it is asked to end."""

    def __init__(self, keys, command, environment=None):
        self.keys = keys
        self.name = type(self).__name__
        self.process = subprocess.Popen(
            command, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True,
            env={**os.environ, **(environment or {})}, preexec_fn=end_with_parent)
        self.process.stdout.readline()
        self.headers = []

    def hold_rings(self):
        """Keeps the headers, so that they can be read when the program is gone."""
        folder = f"/proc/{self.process.pid}/fd"
        names = [name for name in os.listdir(folder)
                 if os.readlink(os.path.join(folder, name)).startswith("/memfd:tarnreporting")]
        for name in sorted(names, key=int):
            with open(os.path.join(folder, name), "rb") as file:
                header = mmap.mmap(file.fileno(), HEADER_BYTES, prot=mmap.PROT_READ)
            assert header[:8] == MAGIC
            self.headers.append(header)
        assert len(self.headers) == len(self.keys)

    def numbers(self, at):
        """One of each ring's numbers, in the order of the keys."""
        return [struct.unpack_from("<Q", header, at)[0] for header in self.headers]

    def kill(self):
        self.process.kill()
        self.process.communicate()

    def end(self):
        """Asks it to end; its status and what it complained of."""
        self.process.terminate()
        _, complaints = self.process.communicate(timeout=4 * PATIENCE)
        return self.process.returncode, complaints


class Poster(Program):
    """One ring_poster: a program with so many rings, whose messages have the keys from `key` on; in bursts, or so many
    a second and ring."""

    def __init__(self, context, service, key, rings, rate=0):
        super().__init__(range(key, key + rings), [
            os.path.join(context.shims, "ring_poster"), service.socket, str(key), str(rings),
            str(context.random.randrange(2**31)), *([str(rate)] if rate else [])])


class Player(Program):
    """One session_player: short sessions one after the other, by the C++ interface."""

    def __init__(self, context, service, key, rate):
        super().__init__(range(key, key + 1), [os.path.join(context.shims, "session_player"), service.socket, str(key),
                                               str(context.random.randrange(2**31)), str(rate)])


class PythonPoster(Program):
    """One python_poster: messages of any keys, by the Python package."""

    def __init__(self, context, service, key, rate):
        program = os.path.join(os.path.dirname(os.path.abspath(__file__)), "python_poster.py")
        library = os.path.join(context.shims, "..", "..", "clients", "c", "libtarnreporting.so.1")
        super().__init__(range(key, key + 1),
                         [sys.executable, "-B", program, service.socket, str(key),
                          str(context.random.randrange(2**31)), str(rate)],
                         {"TARNREPORTING_LIBRARY": os.path.abspath(library)})


def eventually(holds, patience=PATIENCE):
    deadline = time.monotonic() + patience
    while not holds():
        if time.monotonic() > deadline:
            return False
        time.sleep(0.005)
    return True


def numbers_after(service, row):
    """{key: Counter of the numbers that are recorded} after that row, and the last row."""
    reader = service.reader()
    rows = rows_after(reader, row)
    reader.close()
    found = {}
    for _, key, number in rows:
        found.setdefault(key, Counter())[number] += 1
    return found, rows[-1][0] if rows else row


def missing(numbers, posted):
    """Which of the numbers that were posted aren't there."""
    return [number for number in range(FIRST, FIRST + posted) if number not in numbers]


def doubled(numbers):
    return sorted(number for number, count in numbers.items() if count > 1)
