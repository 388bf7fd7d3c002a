# SPDX-License-Identifier: Apache-2.0
"""How long tarnreporting-fleet takes for its answers over N events.

    COLLECT=build/bin/tarnreporting-collect ASK=build/bin/tarnreporting-fleet python3 bench/fleet_report.py

The layout is the collector's; the events are made by SQL, and counted by what the collector counts by, as two of them
would have counted them. Before anything is timed the counts are compared with the events, and the page with both. The
database is restarted then, so that the first time is that of a server that has nothing at hand. A line of JSON for
each question, with the median of the further runs.
"""

import argparse
import json
import os
import re
import shutil
import statistics
import subprocess
import sys
import tempfile
import time

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
sys.path.insert(0, os.path.join(ROOT, "tests", "fleet", "collect"))
import postgres  # noqa: E402

DAYS, BEGIN = 30, "'2026-11-01 00:00+00'::timestamptz"
# Of a device's id its kind, and what it is of: spread by a hash, the same each time.
ROLL = "(hashint8extended(d * 1000003::bigint + i, {seed}) & 1048575)"
PAYLOAD = f"""CASE WHEN i % 10 = 3 THEN jsonb_build_object('HostApplicationDisplayID', '0:app' || d % 20,
    'active_devices', '0:route' || {ROLL} % 8, 'play_seconds', ({ROLL} % 400) / 4.0,
    'KvSessionVolume', {ROLL} % 17 / 16.0, 'msgidx', 1, 'msgcnt', 1)
  WHEN i % 37 = 5 THEN jsonb_build_object('HostApplicationDisplayID', '0:app' || d % 20,
    'active_devices', '0:route' || {ROLL} % 8, 'audiotag', 'IOError', 'issue_type',
    (ARRAY['overload', 'overload', 'silence', 'late'])[1 + {ROLL} % 4], 'smallest_buffer_frame_size', 512)
  ELSE jsonb_build_object('HostApplicationDisplayID', '0:app' || d % 20, 'active_devices', '0:route' || {ROLL} % 8,
    'audiotag', 'PlaybackStart', 'session_output_running', true) END"""
NAME = """'sys.oxbow.tarnkit.' || CASE WHEN i % 10 = 3 THEN 'Volume.Summary' WHEN i % 37 = 5 THEN 'IO.Error'
    ELSE 'Playback.Start' END"""

# {devices}, {ids}: how many, of each device; a device's ids are spread over all days.
DEVICES = f"""
INSERT INTO devices(name) SELECT md5('device' || n) FROM generate_series(1, {{devices}}) AS n;
INSERT INTO runs(device, id, boot, version, started, looked_at)
  SELECT id, 1, 'boot' || id, '1.' || id % 6, {BEGIN}, 1 FROM devices ORDER BY id;
INSERT INTO sessions SELECT r.key, n, r.device, 'player', '0:app' || r.device % 20, 7, 'longformaudio',
    {BEGIN} + (n * 50.0 / {{ids}}) * interval '{DAYS} days',
    {BEGIN} + ((n + 0.9) * 50.0 / {{ids}}) * interval '{DAYS} days', 'stopped', 1
  FROM runs AS r, generate_series(0, {{ids}} / 50 - 1) AS n;
INSERT INTO periods SELECT run, id, id, device, created, ended, 50, 5, 1 FROM sessions;
INSERT INTO told SELECT device, 1 + n * 200, least((n + 1) * 200, {{ids}}), '{{{{}}}}' FROM runs,
    generate_series(0, ({{ids}} - 1) / 200) AS n;
SELECT make_day(({BEGIN} + n * interval '1 day')::date) FROM generate_series(0, {DAYS}) AS n"""
# One day's, in the order of the table's key.
EVENTS = f"""
INSERT INTO events SELECT d, r.key, i, {BEGIN} + (i::float8 / ({{ids}} + 1)) * interval '{DAYS} days', (i - 1) / 50,
    'tally', {NAME}, {PAYLOAD}, '{{{{}}}}'
  FROM (SELECT device AS d, key FROM runs ORDER BY device) AS r,
    generate_series({{ids}}::bigint * {{day}} / {DAYS} + 1, {{ids}}::bigint * ({{day}} + 1) / {DAYS}) AS i"""
# What the collector takes of an event, by the keeper of one that has this device's messages.
COUNTS = """
CREATE TEMPORARY TABLE measured AS
SELECT date_trunc('hour', e.time) AS hour, e.payload ->> 'HostApplicationDisplayID' AS application,
    e.payload ->> 'active_devices' AS route, r.version AS release, (e.device % 2)::smallint AS keeper,
    CASE WHEN e.name = 'sys.oxbow.tarnkit.Volume.Summary' THEN number_of(e.payload -> 'play_seconds') END AS played,
    number_of(e.payload -> 'KvSessionVolume') AS volume,
    coalesce((e.payload ->> 'issue_type' = 'overload')::integer, 0) AS overloads,
    e.payload ->> 'issue_type' AS issue_type
  FROM events AS e JOIN runs AS r ON r.key = e.run
  WHERE e.name = 'sys.oxbow.tarnkit.Volume.Summary' OR e.payload ? 'issue_type';
INSERT INTO hour_parts SELECT hour, application, route, release, keeper, count(played), coalesce(sum(played), 0),
    sum(overloads) FROM measured WHERE played IS NOT NULL OR overloads > 0 GROUP BY 1, 2, 3, 4, 5;
INSERT INTO hour_volume_parts SELECT hour, application, route, release, least(9, floor(volume * 10))::smallint, keeper,
    sum(played) FROM measured WHERE played IS NOT NULL GROUP BY 1, 2, 3, 4, 5, 6;
INSERT INTO hour_issue_parts SELECT hour, issue_type, keeper, count(*) FROM measured WHERE issue_type IS NOT NULL
    GROUP BY 1, 2, 3;
INSERT INTO stored_parts SELECT device, device % 2, count(*) FROM events GROUP BY 1"""


def fill(options, database):
    """Seconds that it took."""
    begun = time.monotonic()
    database.ask(DEVICES.format(devices=options.devices, ids=options.ids))
    for day in range(DAYS):
        database.ask(EVENTS.format(ids=options.ids, day=day, seed=options.seed))
    database.ask(COUNTS)
    # As it does by itself after a while.
    database.ask("VACUUM ANALYZE")
    return time.monotonic() - begun


def check(options, database):
    """The counts are those of the events."""
    events = options.devices * options.ids
    if database.number("SELECT count(*) FROM events") != events:
        raise RuntimeError("not all events are there")
    made = database.ask("SELECT sum(made), sum(records), sum(missing + untold + gaps + left_out + surplus) FROM "
                        "account_by_counts")
    if made != [[str(events), str(events), "0"]]:
        raise RuntimeError(f"the account is uneven: {made}")
    counted = database.ask("SELECT sum(play_seconds), sum(overloads) FROM hours")
    told = database.ask("SELECT (SELECT sum(play_seconds) FROM v_volume), (SELECT count(*) FROM v_issues WHERE "
                        "issue_type = 'overload')")
    if counted != told:
        raise RuntimeError(f"the hours say {counted}, the events {told}")
    return int(told[0][1])


def ask(options, database, *words):
    begun = time.monotonic()
    done = subprocess.run([os.environ["ASK"], *words, "--db", database.url], check=True, stdout=subprocess.PIPE,
                          text=True)
    return time.monotonic() - begun, done.stdout


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--devices", type=int, default=2000)
    parser.add_argument("--ids", type=int, default=5000)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--runs", type=int, default=5)
    parser.add_argument("--exact", action="store_true", help="also report --exact, once")
    options = parser.parse_args()
    folder = tempfile.mkdtemp(prefix="tarnreport")
    database = postgres.Database(folder, extra=["-c", "max_wal_size=4GB"])
    try:
        database.start()
        configuration = os.path.join(folder, "collect.toml")
        with open(configuration, "w", encoding="utf-8") as file:
            file.write(f"[database]\nurl = \"{database.url}\"\n")
        subprocess.run([os.environ["COLLECT"], "--config", configuration, "--migrate"], check=True,
                       stderr=subprocess.DEVNULL)
        seconds = fill(options, database)
        overloads = check(options, database)
        print(json.dumps({"events": options.devices * options.ids, "devices": options.devices, "seed": options.seed,
                          "filled_seconds": round(seconds, 1),
                          "database_mb": round(database.number("SELECT pg_database_size(current_database()) / 1e6")),
                          "hour_rows": int(database.number("SELECT count(*) FROM hour_parts")),
                          "volume_rows": int(database.number("SELECT count(*) FROM hour_volume_parts")),
                          "sessions": int(database.number("SELECT count(*) FROM sessions"))}), flush=True)
        _, page = ask(options, database, "report")
        if not re.search(rf">Overloads</th><td[^>]*>{overloads}<", page):
            raise RuntimeError("the page has other overloads than the events")
        database.end()
        database.start()
        questions = [("report",), ("top",), ("sessions",)]
        for words in questions + ([("report", "--exact")] if options.exact else []):
            first, _ = ask(options, database, *words)
            more = [ask(options, database, *words)[0] for _ in range(0 if "--exact" in words else options.runs)]
            print(json.dumps({"question": " ".join(words), "first_seconds": round(first, 3),
                              "median_seconds": round(statistics.median(more or [first]), 3), "runs": len(more)}),
                  flush=True)
    finally:
        database.end()
        shutil.rmtree(folder, True)


if __name__ == "__main__":
    main()
