#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Plays a WAV file at the pace of a clock, heard by nobody, and reports what it does.

usage: wavplay.py [--volume V] [--route NAME] [--at SECONDS volume=V|route=NAME]... FILE

Prints one line of JSON: what was played.
"""

import argparse
import json
import time
import wave

import tarnreporting

PERIOD = 0.02


def play(file, volume, route, changes, session):
    """Plays the frames period by period; how many there were. Each report has the time at which its frame plays."""
    rate, began, played = file.getframerate(), time.time(), 0
    session.output_running(volume, route, stamp=began)
    while frames := file.readframes(int(rate * PERIOD)):
        moment = began + played / rate
        while changes and changes[0][0] <= played / rate:
            _, what, value = changes.pop(0)
            if what == "volume":
                session.volume_changed(float(value), stamp=moment)
            else:
                session.route_changed(value, stamp=moment)
        late = time.time() - moment
        if late > PERIOD:
            session.overload(frames=int(rate * PERIOD), cycle=round(played / rate / PERIOD))
        played += len(frames) // (file.getnchannels() * file.getsampwidth())
        time.sleep(max(0.0, began + played / rate - time.time()))
    session.output_stopped(stamp=began + played / rate)
    return played


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--volume", type=float, default=1.0)
    parser.add_argument("--route", default="Speaker")
    parser.add_argument("--at", nargs=2, action="append", default=[], metavar=("SECONDS", "CHANGE"))
    parser.add_argument("file")
    options = parser.parse_args()
    changes = [(float(seconds), *change.split("=", 1)) for seconds, change in options.at]
    with wave.open(options.file) as file, tarnreporting.Client() as client:
        with client.session(tarnreporting.ServiceType.LONG_FORM_AUDIO, "org.example.wavplay.py") as session:
            played = play(file, options.volume, options.route, changes, session)
        untaken = client.close(timeout=1)
        print(json.dumps({"frames": played, "silence": 0, "rate": file.getframerate(), "untaken": untaken}))


if __name__ == "__main__":
    main()
