# SPDX-License-Identifier: Apache-2.0
"""Connections of which each is worth a line in the log, and between them a client that asks how the service is.

usage: strangers.py COUNT

Prints how many milliseconds the slowest answer took.
"""

import json
import socket
import sys
import time

import wire

SOCKET = "/run/tarnreporting/socket"
NO_FRAME = b"\xff\xff\xff\xff"


def main(count):
    slowest = 0.0
    with wire.Client(SOCKET) as client:
        for _ in range(count):
            with socket.socket(socket.AF_UNIX) as stranger:
                stranger.connect(SOCKET)
                stranger.send(NO_FRAME)
                stranger.recv(1)  # that it was cut
            begun = time.monotonic()
            client.call(wire.STATUS)
            slowest = max(slowest, (time.monotonic() - begun) * 1000)
    print(json.dumps(slowest))


if __name__ == "__main__":
    main(int(sys.argv[1]))
