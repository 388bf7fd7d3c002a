# SPDX-License-Identifier: Apache-2.0
"""What the store has of one program's numbered messages.

usage: recorded.py KEY

Prints one JSON object: how many are there, how many different ones, the least and the greatest number; the periods of
its sessions, and how many of them haven't exactly one summary (one that a kill ended may have none); and whether
retention has removed anything, of whichever program.
"""

import json
import sqlite3
import sys

STORE = "file:/var/lib/tarnreporting/recorder.sqlite3?mode=ro"
NUMBERS = ("SELECT count(*), count(DISTINCT number), min(number), max(number) FROM (SELECT "
           "json_extract(payload, '$.campaign_number') AS number FROM events WHERE backend = 'tally' "
           "AND name LIKE 'sys.oxbow.tarnkit.%' AND json_extract(payload, '$.campaign_client') = ?)")
PERIODS = ("SELECT s.end_reason, (SELECT count(*) FROM events AS e WHERE e.session = s.id AND "
           "e.name = 'sys.oxbow.tarnkit.Session_Generic.Summary') FROM sessions AS s JOIN periods AS p "
           "ON p.session = s.id WHERE s.application = 'org.example.load'")
REMOVED = "SELECT value > 0 FROM recorder_state WHERE name = 'holds_after'"
RANGES = "SELECT 1 FROM sqlite_master WHERE name = 'recorder_removed'"


def main(key):
    store = sqlite3.connect(STORE, uri=True)
    rows, different, least, greatest = store.execute(NUMBERS, (key,)).fetchone()
    periods = store.execute(PERIODS).fetchall()
    removed = store.execute(REMOVED).fetchone() == (1,) or store.execute(RANGES).fetchone() is not None
    odd = [[reason, summaries] for reason, summaries in periods
           if summaries != 1 and (reason != "killed" or summaries > 1)]
    print(json.dumps({"rows": rows, "different": different, "least": least, "greatest": greatest,
                      "periods": len(periods), "odd": odd, "removed": removed}))


if __name__ == "__main__":
    main(int(sys.argv[1]))
