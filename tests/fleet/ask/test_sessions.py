# SPDX-License-Identifier: Apache-2.0
"""`sessions` of tarnreporting-fleet with a real database: those that were asked for, as the devices told of them."""

import os
import sys
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
from asking import BEGIN, HOSTILE, Asking  # noqa: E402


class Sessions(Asking):
    def put_five(self):
        self.put_session(1, ended=BEGIN + 60, reason="stopped", periods=[(BEGIN + 1, BEGIN + 21), (BEGIN + 30, None)])
        self.put_session(2, created=BEGIN + 100, periods=[(BEGIN + 110, None)], looked_at=BEGIN + 170)
        self.put_session(3, created=BEGIN + 200, application="org.example.player", ended=BEGIN + 200.25,
                         reason="retyped")
        self.put_session(1, device="bb22", release="2.0", created=BEGIN + 300, application="org.example.other")
        self.put_session(2, device="bb22", release="2.0", created=BEGIN + 400, ended=BEGIN + 500, reason="killed",
                         periods=[(BEGIN + 400, BEGIN + 450)])

    def found(self, *arguments):
        return [(row["device"], row["session"]) for row in self.rows("sessions", *arguments)]

    def test_each_row_has_what_the_device_told(self):
        self.put_five()
        rows = {(row["device"], row["session"]): row for row in self.rows("sessions")}
        self.assertEqual(rows["aa11", 1], {
            "device": "aa11", "run": 1, "session": 1, "release": "1.0", "process": "player", "application": "app",
            "service_type": 7, "service_name": "longformaudio", "created": BEGIN, "ended": BEGIN + 60,
            "end_reason": "stopped", "looked_at": BEGIN + 3600, "running": False, "active": 50, "periods": 2,
            "messages": 20, "redundant": 4, "overloads": 0})
        running = rows["aa11", 2]
        # It runs until it was looked at last.
        self.assertEqual((running["running"], running["active"], running["ended"], running["end_reason"]),
                         (True, 60, None, None))
        self.assertEqual((rows["bb22", 1]["running"], rows["bb22", 1]["active"]), (False, 0))

    def test_the_newest_come_first_and_only_so_many(self):
        self.put_five()
        newest = [("bb22", 2), ("bb22", 1), ("aa11", 2), ("aa11", 1)]
        self.assertEqual(self.found(), newest)
        self.assertEqual(self.found("--limit", "2"), newest[:2])
        self.assertEqual(self.found("--limit", "4"), newest)

    def test_patterns_times_and_states_narrow_it(self):
        self.put_five()
        self.assertEqual(self.found("--all")[2], ("aa11", 3))
        self.assertEqual(self.found("--device", "aa*"), [("aa11", 2), ("aa11", 1)])
        self.assertEqual(self.found("--release", "[2-9].*"), [("bb22", 2), ("bb22", 1)])
        self.assertEqual(self.found("--app", "org.example.*"), [("bb22", 1)])
        self.assertEqual(self.found("--application", "app", "--device", "bb22"), [("bb22", 2)])
        self.assertEqual(self.found("--open"), [("bb22", 1), ("aa11", 2)])
        self.assertEqual(self.found("--since", f"@{BEGIN + 500}"), [("bb22", 2), ("bb22", 1), ("aa11", 2)])
        self.assertEqual(self.found("--since", f"@{BEGIN + 500.5}"), [("bb22", 1), ("aa11", 2)])
        self.assertEqual(self.found("--until", f"@{BEGIN + 100}"), [("aa11", 1)])
        self.assertEqual(self.found("--until", f"@{BEGIN + 100.5}"), [("aa11", 2), ("aa11", 1)])
        self.assertEqual(self.found("--limit", "1", "--app", "org*"), [("bb22", 1)])

    def test_a_rare_one_is_found_behind_thousands_of_others(self):
        self.put_session(1, device="cc33", application="rare")
        self.put_session(1)
        self.database.ask("INSERT INTO sessions SELECT run, n, device, process, application, service_type, "
                          "service_name, created + n * interval '1 second', ended, end_reason, looked_at FROM sessions,"
                          " generate_series(2, 5000) AS n WHERE application = 'app'")
        self.assertEqual(self.found("--app", "rare", "--limit", "3"), [("cc33", 1)])
        self.assertEqual(len(self.found("--limit", "4500")), 4500)

    def test_overloads_are_those_of_the_session_and_not_of_its_summary(self):
        self.put_session(1, ended=BEGIN + 60, reason="stopped")
        self.put_session(2)
        overload = {"issue_type": "overload"}
        self.put_event(1, 1, BEGIN + 5, overload)
        self.put_event(2, 1, BEGIN + 6, overload)
        self.put_event(3, 2, BEGIN + 7, overload)
        self.put_event(4, 1, BEGIN + 8, {"issue_type": "silence"})
        self.put_event(5, 1, BEGIN + 9, {"issue_type": "overload", "overload_count": 2})
        self.put_event(6, 1, BEGIN + 10, overload, name="sys.oxbow.longformaudio.IO")
        self.put_event(7, 1, BEGIN + 86000, overload)
        # Nobody's clock is that wrong.
        self.put_event(8, 1, BEGIN + 60 + 86401, overload)
        self.assertEqual({row["session"]: row["overloads"] for row in self.rows("sessions")}, {1: 3, 2: 1})

    def test_the_table_says_the_same_in_local_time(self):
        self.put_five()
        lines = [line.split() for line in self.ask("sessions").splitlines()]
        self.assertEqual(lines[0], ["DEVICE", "RUN", "SESSION", "CREATED", "RELEASE", "PROCESS", "APPLICATION",
                                    "SERVICE", "ACTIVE", "OVERLOADS", "END"])
        self.assertEqual(lines[-1], ["aa11", "1", "1", "2026-11-18", "11:06:40", "1.0", "player", "app",
                                     "longformaudio", "50.0", "s", "0", "stopped"])
        self.assertEqual([line[-1] for line in lines[1:]], ["killed", "open", "running", "stopped"])
        self.assertIn("\x1b[31mkilled", self.ask("sessions", "--color", "always"))
        self.assertIn("2026-11-18 12:06:40", self.ask("sessions", "-q", TZ="Europe/Berlin"))

    def test_of_a_made_up_fleet_all_are_there(self):
        truth = self.collect_made_up("--devices", 5, "--ids", 1500, "--seed", 12)
        rows = self.rows("sessions", "--limit", "100000", "--all")
        self.assertEqual(len(rows), truth["sessions"])
        self.assertEqual(len({(row["device"], row["run"], row["session"]) for row in rows}), truth["sessions"])
        # But for those of nobody, and of days when a clock was wrong.
        self.assertEqual(sum(row["overloads"] for row in rows), self.database.number(
            "SELECT count(*) FROM events AS e JOIN sessions AS s ON s.run = e.run AND s.id = e.session WHERE "
            "payload ->> 'issue_type' = 'overload' AND e.time >= s.created - interval '1 day' AND (s.ended IS NULL OR "
            "e.time < s.ended + interval '1 day')"))

    def test_an_empty_database_has_no_rows(self):
        self.assertEqual(self.ask("sessions"), "")

    def test_nothing_that_a_terminal_obeys_comes_through(self):
        self.put_session(1, application=HOSTILE, release=HOSTILE, process=HOSTILE, ended=BEGIN, reason=HOSTILE)
        row, = self.rows("sessions")
        self.assertEqual([row[name] for name in ("application", "release", "process", "end_reason")], [HOSTILE] * 4)
        for arguments in (("sessions",), ("sessions", "--json")):
            text = self.ask(*arguments)
            self.assertNotIn("\x1b", text)
            self.assertNotIn("\u202e", text)


if __name__ == "__main__":
    unittest.main()
