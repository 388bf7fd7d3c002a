# SPDX-License-Identifier: Apache-2.0
"""Programs that post to rings, and the rings themselves as anybody can see them who may look at the program's memory
files."""

import mmap
import os
import struct
import subprocess
import time
from collections import Counter

from account import FIRST, rows_after
from service import PATIENCE, end_with_parent

HEADER_BYTES = 4096
MAGIC = b"TARNRING"
POSTED, DROPPED, TAKEN_MESSAGES = 72, 80, 144


class Poster:
    """One ring_poster: a program with so many rings, whose messages have the keys from `key` on."""

    def __init__(self, context, service, key, rings):
        self.keys = range(key, key + rings)
        self.process = subprocess.Popen(
            [os.path.join(context.shims, "ring_poster"), service.socket, str(key), str(rings),
             str(context.random.randrange(2**31))],
            stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True,
            preexec_fn=end_with_parent)
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
