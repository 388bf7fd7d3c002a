# SPDX-License-Identifier: Apache-2.0
"""Ends the service again and again, and tells how long each time it took until it answered.

usage: restarts.py COUNT restart|kill

"restart" asks the service manager for one; "kill" kills the process, which the manager replaces by itself. Prints one
JSON object: the milliseconds of each.
"""

import json
import random
import subprocess
import sys
import time

import wire

SOCKET = "/run/tarnreporting/socket"
UNIT = "tarnreportingd.service"
PATIENCE = 60


def process():
    told = subprocess.run(["systemctl", "show", "--value", "--property=MainPID", UNIT], capture_output=True, text=True,
                          check=True).stdout
    return int(told)


def restart():
    subprocess.run(["systemctl", "restart", UNIT], check=True)


def kill():
    """Until somebody else serves: the one that is killed answers until it is gone."""
    before = process()
    subprocess.run(["systemctl", "kill", "--signal=KILL", "--kill-whom=main", UNIT], check=True)
    while process() in (before, 0):
        time.sleep(0.005)


def answered():
    with wire.Client(SOCKET, patience=PATIENCE) as client:
        client.call(wire.STATUS)


def main(count, how):
    waits = []
    for _ in range(count):
        time.sleep(random.uniform(0.05, 0.4))
        begun = time.monotonic()
        {"restart": restart, "kill": kill}[how]()
        answered()
        waits.append((time.monotonic() - begun) * 1000)
    print(json.dumps(waits))


if __name__ == "__main__":
    main(int(sys.argv[1]), sys.argv[2])
