# SPDX-License-Identifier: Apache-2.0
"""Writes one setting after another and has the service read them, a tenth of them from a broken file.

usage: reloads.py COUNT

Prints one JSON object: good and broken ones, and what went wrong, which is a broken one that was taken or a good one
that wasn't: both are told by the number of good reloads, by the fault, and by the quota that the service goes by.
"""

import json
import os
import random
import subprocess
import sys
import time

import wire

SOCKET = "/run/tarnreporting/socket"
DROP_IN = "/etc/tarnreporting/tarnreportingd.toml.d/90-reloads.toml"
BROKEN = ("[limits]\nsessions_per_user = 0\n", "[limits\n", "[limit]\n", "sessions_per_user = 1\n", "\x00\n")
PATIENCE = 10


def reload(text):
    os.makedirs(os.path.dirname(DROP_IN), exist_ok=True)
    with open(DROP_IN + ".new", "w", encoding="utf-8") as file:
        file.write(text)
    os.replace(DROP_IN + ".new", DROP_IN)
    subprocess.run(["systemctl", "reload", "tarnreportingd.service"], check=True)


def settled(client, before):
    """The status once the reload is over."""
    end = time.monotonic() + PATIENCE
    while time.monotonic() < end:
        now = client.call(wire.STATUS)
        if any(now[name] != before[name] for name in ("configuration_generation", "configuration_reloads_refused")):
            return now
        time.sleep(0.001)
    return before


def one(client, number, told):
    broken = number > 0 and random.random() < 0.1
    quota = 1000 + number
    before = client.call(wire.STATUS)
    reload(random.choice(BROKEN) if broken else f"[limits]\nsessions_per_user = {quota}\n")
    after = settled(client, before)
    told["broken" if broken else "good"] += 1
    taken = after["configuration_generation"] - before["configuration_generation"]
    refused = after["configuration_reloads_refused"] - before["configuration_reloads_refused"]
    if (taken, refused) != ((0, 1) if broken else (1, 0)) or bool(after["configuration_fault"]) != broken:
        told["wrong"].append(f"{number}: {'broken' if broken else 'good'}: {taken} taken, {refused} refused, "
                             f"fault {after['configuration_fault']!r}")
    return quota if not broken else None


def main(count):
    told = {"good": 0, "broken": 0, "wrong": [], "live": 0, "expected": 0}
    with wire.Client(SOCKET, patience=PATIENCE) as client:
        for number in range(count):
            quota = one(client, number, told)
            told["expected"] = quota or told["expected"]
        text = subprocess.run(["tarnreportingctl", "status", "--quotas"], capture_output=True, text=True,
                              check=True).stdout
        told["live"] = str(told["expected"]) in text
        os.remove(DROP_IN)
        subprocess.run(["systemctl", "reload", "tarnreportingd.service"], check=True)
    print(json.dumps(told))


if __name__ == "__main__":
    main(int(sys.argv[1]))
