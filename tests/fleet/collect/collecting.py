# SPDX-License-Identifier: Apache-2.0
"""What the trials of tarnreporting-collect share: its programs, and the account that must come out even."""

import json
import os
import shutil
import subprocess
import tempfile
import unittest

import postgres

COLLECT, PRODUCER = os.environ["COLLECT"], os.environ["PRODUCER"]


def produce(*arguments):
    """What must come of what was sent."""
    return json.loads(subprocess.run([PRODUCER, *map(str, arguments)], check=True, stdout=subprocess.PIPE).stdout)


@unittest.skipIf(postgres.lacking(), postgres.lacking())
class Collecting(unittest.TestCase):
    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="tarncollect")
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.database = postgres.Database(self.place_of_database())
        self.database.start()
        self.addCleanup(self.database.end)
        self.configuration = os.path.join(self.folder, "collect.toml")
        self.configure()

    def place_of_database(self):
        return self.folder

    def configure(self, **sections):
        with open(self.configuration, "w", encoding="utf-8") as file:
            for section, values in {"database": {"url": self.database.url}, **sections}.items():
                file.write(f"[{section}]\n")
                file.writelines(f"{key} = {json.dumps(value)}\n" for key, value in values.items())

    def command(self, *arguments):
        return [COLLECT, "--config", self.configuration, "--log-level", "debug", *arguments]

    def collect(self, *arguments, status=0):
        done = subprocess.run(self.command(*arguments), capture_output=True, text=True, check=False, timeout=300)
        self.assertEqual(done.returncode, status, done.stderr)
        return done.stderr

    def account(self):
        names = ("made", "stored", "gaps", "left_out", "missing", "untold", "records")
        row = self.database.ask("SELECT " + ", ".join(f"coalesce(sum({name}), 0)" for name in names) + " FROM account")
        return dict(zip(names, map(int, row[0])))

    def assert_even(self, truth):
        """Nothing is missing, nothing twice, and the hours say what the events say."""
        self.assertEqual(self.account(), {
            "made": truth["made"], "stored": truth["events"], "gaps": truth["gaps"], "left_out": truth["left_out"],
            "missing": 0, "untold": 0, "records": truth["events"]})
        self.assertEqual(self.database.number("SELECT count(*) FROM events"), truth["events"])
        self.assertEqual(self.database.number("SELECT count(*) FROM sessions"), truth["sessions"])
        self.assert_hours(truth)
        self.assert_counts()

    def assert_counts(self):
        """What is counted is what is there."""
        same = "device, name, made, stored, gaps, left_out, missing, untold, records"
        counted = "device, name, made, records, gaps, left_out, missing, untold, records"
        self.assertEqual(self.database.ask(f"SELECT {counted} FROM account_by_counts ORDER BY 1"),
                         self.database.ask(f"SELECT {same} FROM account ORDER BY 1"))
        self.assertEqual(self.database.ask("""
            SELECT * FROM hour_issues FULL JOIN (SELECT date_trunc('hour', time, 'UTC') AS hour, issue_type,
              count(*) AS counted FROM v_issues GROUP BY 1, 2) AS i USING (hour, issue_type)
            WHERE issues IS DISTINCT FROM counted"""), [])

    def assert_hours(self, truth):
        ask = self.database.number
        self.assertEqual(ask("SELECT sum(play_seconds) FROM hours"), truth["play_seconds"])
        self.assertEqual(ask("SELECT sum(overloads) FROM hours"), truth["overloads"])
        self.assertEqual(ask("SELECT sum(play_seconds) FROM hour_volumes"), truth["play_seconds"])

    def assert_hours_by_key(self):
        """The hours are those of the events, for every hour, application, route and release."""
        self.assertEqual(self.database.ask("""
            SELECT coalesce(a.hour, b.hour), a.play_seconds, b.play_seconds, a.overloads, b.overloads FROM hours AS a
            FULL JOIN (
              SELECT date_trunc('hour', e.time, 'UTC') AS hour, payload ->> 'HostApplicationDisplayID' AS application,
                  payload ->> 'active_devices' AS route, coalesce(r.version, '') AS release,
                  coalesce(sum((payload ->> 'play_seconds')::float8), 0) AS play_seconds,
                  count(*) FILTER (WHERE payload ->> 'issue_type' = 'overload') AS overloads
                FROM events AS e LEFT JOIN runs AS r ON r.key = e.run
                WHERE payload ? 'play_seconds' OR payload ? 'issue_type' GROUP BY 1, 2, 3, 4) AS b
            USING (hour, application, route, release)
            WHERE (a.play_seconds, a.overloads) IS DISTINCT FROM (b.play_seconds, b.overloads)"""), [])
