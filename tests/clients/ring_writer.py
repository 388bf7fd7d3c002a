#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Posts messages through a ring, written by docs/ring.md and docs/wire.md alone.

usage: ring_writer.py SOCKET COUNT
"""

import fcntl
import mmap
import os
import socket
import struct
import sys
import time

MAGIC, DATA_BYTES, HEADER_BYTES = b"TARNRING", 4096, 4096
HEAD, POSTED, DROPPED, DROPPED_BYTES, TAKEN, ASLEEP = 64, 72, 80, 88, 128, 192
FILLER, MESSAGE, GAP = 1, 3, 4
SEALS = fcntl.F_SEAL_SHRINK | fcntl.F_SEAL_GROW | fcntl.F_SEAL_SEAL


def cbor(value):
    if isinstance(value, int):
        return struct.pack(">BQ", 0x1B, value)
    if isinstance(value, str):
        return struct.pack(">BQ", 0x7B, len(value.encode())) + value.encode()
    if isinstance(value, list):
        return struct.pack(">BQ", 0x9B, len(value)) + b"".join(map(cbor, value))
    return struct.pack(">BQ", 0xBB, len(value)) + b"".join(cbor(item) for pair in value.items() for item in pair)


class Ring:
    def __init__(self):
        self.memory = os.memfd_create("ring", os.MFD_ALLOW_SEALING)
        os.ftruncate(self.memory, HEADER_BYTES + DATA_BYTES)
        fcntl.fcntl(self.memory, fcntl.F_ADD_SEALS, SEALS)
        self.map = mmap.mmap(self.memory, HEADER_BYTES + DATA_BYTES)
        self.wake = os.eventfd(0, os.EFD_NONBLOCK)
        self.words = memoryview(self.map).cast("Q")
        self.head, self.posted, self.dropped, self.untold, self.woken = 0, 0, [0, 0], [0, 0], 0
        self.map[:8] = MAGIC
        self.words[1], self.words[2] = 1, DATA_BYTES

    def place(self, position, size):
        left = DATA_BYTES - position % DATA_BYTES
        return position if size <= left else position + left

    def put(self, position, kind, content):
        at = HEADER_BYTES + position % DATA_BYTES
        self.map[at:at + 8 + len(content)] = struct.pack("<II", len(content), kind) + content

    def post(self, shape, *values):
        content = struct.pack("<QII", time.time_ns(), shape, len(values)) + b"".join(values)
        records = ([(GAP, struct.pack("<QQ", *self.untold))] if self.untold[0] else []) + [(MESSAGE, content)]
        end, puts = self.head, []
        for kind, content in records:
            size = 8 + (len(content) + 7) // 8 * 8
            at = self.place(end, size)
            if at != end:
                puts.append((end, FILLER, bytes(at - end - 8)))
            puts.append((at, kind, content))
            end = at + size
        if end - self.words[TAKEN // 8] > DATA_BYTES:
            for count in (self.dropped, self.untold):
                count[0], count[1] = count[0] + 1, count[1] + size
            self.words[DROPPED // 8], self.words[DROPPED_BYTES // 8] = self.dropped
            return False
        for put in puts:
            self.put(*put)
        self.untold, self.posted, self.head = [0, 0], self.posted + 1, end
        self.words[HEAD // 8] = end  # seen by all long before the interpreter comes to the next line
        self.words[POSTED // 8] = self.posted
        asleep = self.words[ASLEEP // 8]
        if asleep not in (0, self.woken):
            self.woken = asleep
            os.eventfd_write(self.wake, 1)
        return True


def text(value):
    data = value.encode()
    return struct.pack("<II", len(data), 0) + data + bytes(-len(data) % 8)


def main(path, count):
    ring, service = Ring(), socket.socket(socket.AF_UNIX)
    service.connect(path)
    shape = {"shape": 1, "category": 4, "type": 1, "reporterIDs": [77], "keys": ["number", "name"],
             "kinds": ["integer", "text"]}
    for request in ([1, 1, 77], [2, 2, 7, 77], [3, 5, 77], [4, 103, shape], [5, 102]):
        frame = cbor(request)
        rights = [(socket.SOL_SOCKET, socket.SCM_RIGHTS, struct.pack("ii", ring.memory, ring.wake))]
        service.sendmsg([struct.pack("<I", len(frame)) + frame], rights if request[1] == 102 else [])
    for number in range(count):
        while not ring.post(1, struct.pack("<q", number), text("f\u00fcr " * (number % 7))):
            time.sleep(0.001)
    while ring.words[TAKEN // 8] != ring.head:
        time.sleep(0.001)


main(sys.argv[1], int(sys.argv[2]))
