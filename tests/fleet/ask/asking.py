# SPDX-License-Identifier: Apache-2.0
"""What the trials of tarnreporting-fleet share: the program, and a database with what a test puts into it."""

import json
import os
import subprocess
import sys

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(os.path.dirname(HERE), "collect"))
from collecting import Collecting, produce  # noqa: E402

ASK, CTL = os.environ["ASK"], os.environ["CTL"]
HOSTILE = "</td><script>alert(1)</script>\x1b[31mred\u202e&\"'"
# Of 2026-11-18 11:06:40 UTC, the made-up fleet's first event.
BEGIN = 1795000000


def environment(**more):
    return {"PATH": os.environ["PATH"], "LC_ALL": "C.UTF-8", "TZ": "UTC", **more}


def literal(text):
    return "'" + text.replace("'", "''") + "'"


class Asking(Collecting):
    layout = True

    def setUp(self):
        super().setUp()
        if self.layout:
            self.collect("--migrate")

    def ask(self, *arguments, status=0, database=None, **more):
        """What it prints; beyond success what it complains of."""
        done = subprocess.run([ASK, *arguments, "--db", database or self.database.url], capture_output=True, text=True,
                              check=False, timeout=60, env=environment(**more))
        self.assertEqual(done.returncode, status, done.stderr)
        self.assertEqual(done.stdout if status else done.stderr, "")
        return done.stderr if status else done.stdout

    def rows(self, *arguments):
        return [json.loads(line) for line in self.ask(*arguments, "--json").splitlines()]

    def collect_made_up(self, *arguments):
        """What must be asked back."""
        files = os.path.join(self.folder, "files")
        os.makedirs(files, exist_ok=True)
        truth = produce("--folder", files, *arguments)
        self.collect("--from", files)
        return truth

    def put_hour(self, hour="2026-11-20 10:00+00", application="app", route="route", release="1.0", keeper=0,
                 segments=1, play=3600.0, overloads=0):
        self.database.ask(
            f"INSERT INTO hour_parts VALUES({literal(hour)}, {literal(application)}, {literal(route)}, "
            f"{literal(release)}, {keeper}, {segments}, {play}, {overloads})")

    def put_session(self, number, device="aa11", release="1.0", application="app", created=BEGIN, ended=None,
                    reason=None, periods=(), looked_at=BEGIN + 3600, run=1, process="player"):
        """`periods`: (started, stopped), each a second or None."""
        def moment(second):
            return "NULL" if second is None else f"to_timestamp({second})"

        name = literal(device)
        self.database.ask(f"""
            INSERT INTO devices(name) VALUES({name}) ON CONFLICT DO NOTHING;
            INSERT INTO runs(device, id, boot, version, started, looked_at)
              SELECT id, {run}, 'boot', {literal(release)}, to_timestamp({BEGIN}), 1 FROM devices WHERE name = {name}
              ON CONFLICT DO NOTHING;
            INSERT INTO sessions SELECT r.key, {number}, d.id, {literal(process)}, {literal(application)}, 7,
                'longformaudio', {moment(created)}, {moment(ended)}, {literal(reason) if reason else 'NULL'},
                {looked_at} * 1000000::bigint
              FROM devices AS d JOIN runs AS r ON r.device = d.id AND r.id = {run} WHERE d.name = {name}""")
        for place, (started, stopped) in enumerate(periods):
            self.database.ask(f"""
                INSERT INTO periods SELECT r.key, {number * 100 + place}, {number}, d.id, {moment(started)},
                    {moment(stopped)}, 10, 2, {looked_at} * 1000000::bigint
                  FROM devices AS d JOIN runs AS r ON r.device = d.id AND r.id = {run} WHERE d.name = {name}""")

    def put_event(self, number, session, time, payload, device="aa11", name="sys.oxbow.tarnkit.IO.Error"):
        self.database.ask(f"""
            SELECT make_day((to_timestamp({time}) AT TIME ZONE 'UTC')::date);
            INSERT INTO events SELECT d.id, r.key, {number}, to_timestamp({time}), {session}, 'tally', {literal(name)},
                {literal(json.dumps(payload))}, '{{}}'
              FROM devices AS d JOIN runs AS r ON r.device = d.id WHERE d.name = {literal(device)} LIMIT 1""")
