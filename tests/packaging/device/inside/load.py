# SPDX-License-Identifier: Apache-2.0
"""Reports as a program does that uses the installed library: numbered messages, RATE a second, in one session after
another, until its standard input ends.

usage: load.py KEY RATE

Prints "posting", and at its end one JSON object: how many were posted, how many found no room, how many the service had
not taken at the close, and the first failing call's text. A service that ends and comes back is nothing that a call
tells of.
"""

import json
import random
import sys
import threading
import time

import tarnreporting
from tarnreporting import Category, Type

TURN = 0.01
CLOSE_SECONDS = 60


def main(key, rate):
    ended = threading.Event()
    threading.Thread(target=lambda: (sys.stdin.read(), ended.set()), daemon=True).start()
    told = {"posted": 0, "no_room": 0, "left": 0, "sessions": 0, "error": ""}
    try:
        client = tarnreporting.Client(ring_bytes=1048576)
        print("posting", flush=True)
        while not ended.is_set():
            play_session(client, key, rate, ended, told)
        told["left"] = client.close(CLOSE_SECONDS)
    except tarnreporting.Error as error:
        told["error"] = str(error)
    print(json.dumps(told), flush=True)


def play_session(client, key, rate, ended, told):
    told["sessions"] += 1
    due = time.monotonic()
    with client.session(application="org.example.load") as session:
        for _ in range(random.randrange(50, 300)):
            if ended.is_set():
                break
            for _ in range(int(rate * TURN)):
                posted = session.post(Category.PLAYBACK, Type.START,
                                      {"campaign_client": key, "campaign_number": told["posted"]})
                told["posted" if posted else "no_room"] += 1
            due += TURN
            time.sleep(max(0, due - time.monotonic()))


if __name__ == "__main__":
    main(int(sys.argv[1]), int(sys.argv[2]))
