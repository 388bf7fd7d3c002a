# SPDX-License-Identifier: Apache-2.0
"""Has ring_writer.py, which knows the documents alone, post to the real service, and looks at what was recorded.

usage: check_ring_writer.py TARNREPORTINGD
"""

import json
import os
import signal
import sqlite3
import subprocess
import sys
import tempfile
import time

SECONDS = 30
COUNT = 3000
QUERY = "SELECT payload FROM events WHERE name = 'sys.oxbow.tarnkit.Playback.Start' ORDER BY id"


def main(program):
    writer = os.path.join(os.path.dirname(os.path.abspath(__file__)), "ring_writer.py")
    with tempfile.TemporaryDirectory(prefix="tarn ring ") as folder:
        path = os.path.join(folder, "socket")
        service = subprocess.Popen([program, "--socket", path, "--state-dir", os.path.join(folder, "state")],
                                   stderr=subprocess.PIPE, text=True)
        deadline = time.monotonic() + SECONDS
        while not os.path.exists(path) and time.monotonic() < deadline and service.poll() is None:
            time.sleep(0.02)
        try:
            done = subprocess.run([sys.executable, "-B", writer, path, str(COUNT)], timeout=SECONDS)
        finally:
            service.send_signal(signal.SIGTERM)
            complaints = service.communicate(timeout=SECONDS)[1]
        with sqlite3.connect(os.path.join(folder, "state", "recorder.sqlite3")) as store:
            payloads = [json.loads(row[0]) for row in store.execute(QUERY)]
    if done.returncode != 0 or " error " in complaints:
        raise SystemExit(f"the writer ended with {done.returncode}; the service said:\n{complaints}")
    found = [(payload["number"], payload["name"]) for payload in payloads]
    if found != [(number, "f\u00fcr " * (number % 7)) for number in range(COUNT)]:
        raise SystemExit(f"{len(found)} messages were recorded of {COUNT}, or not in their order: {found[:3]}")


main(sys.argv[1])
