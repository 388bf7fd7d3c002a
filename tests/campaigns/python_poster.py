#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Posts numbered messages of any keys by the Python package, until it is asked to end (SIGTERM), and begins another
session now and then. Its status says whether anything was raised, or the close left messages.

usage: python_poster.py SOCKET KEY SEED RATE    with TARNREPORTING_LIBRARY; RATE: so many messages a second
"""

import os
import random
import signal
import sys
import time

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..", "clients", "python"))
import tarnreporting  # noqa: E402
from tarnreporting import Category, Type  # noqa: E402

from account import FIRST  # noqa: E402

CLOSE_SECONDS = 60
stopping = False


def stop(*_):
    global stopping
    stopping = True


def play_session(client, key, number, pauses):
    """One session's messages; the number after the last one that was posted."""
    with client.session(application="org.example.python") as session:
        for pause in pauses:
            if session.post(Category.PLAYBACK, Type.START, {"campaign_client": key, "campaign_number": number}):
                number += 1
            if stopping:
                break
            time.sleep(pause)
    return number


def main(path, key, seed, rate):
    signal.signal(signal.SIGTERM, stop)
    choice = random.Random(int(seed))
    client, number = tarnreporting.Client(path, ring_bytes=65536), FIRST
    print("posting", flush=True)
    while not stopping:
        number = play_session(client, int(key), number, [1 / float(rate)] * choice.randrange(1500))
    return 0 if client.close(CLOSE_SECONDS) == 0 else 1


if __name__ == "__main__":
    sys.exit(main(*sys.argv[1:]))
