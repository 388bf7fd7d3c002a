# SPDX-License-Identifier: Apache-2.0
"""`top` of tarnreporting-fleet with a real database: the numbers are those that were put in, the worst first."""

import os
import sys
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
from asking import HOSTILE, Asking  # noqa: E402

# Garwood's limits for counts of 10, 1 and 0.
TEN, ONE, NONE = (4.795, 18.390), (0.0253, 5.572), (0, 3.689)


class Top(Asking):
    def put_three_routes(self):
        # Of two collectors, and of three hours.
        self.put_hour(route="speaker", segments=2, play=3600, overloads=4)
        self.put_hour(route="speaker", segments=3, play=1800, overloads=5, keeper=1)
        self.put_hour("2026-11-20 11:00+00", route="speaker", release="1.1", play=1800, overloads=1)
        self.put_hour("2026-11-20 12:00+00", route="radio", play=2, overloads=1)
        self.put_hour("2026-11-20 12:00+00", route="line", play=7200, overloads=0)

    def test_each_row_has_the_numbers_and_the_interval_of_what_was_put_in(self):
        self.put_three_routes()
        rows = self.rows("top", "--by", "route")
        self.assertEqual([row["name"] for row in rows], ["radio", "speaker", "line"])
        radio, speaker, line = rows
        self.assertEqual((speaker["by"], speaker["segments"], speaker["play_seconds"], speaker["overloads"]),
                         ("route", 6, 7200, 10))
        self.assertEqual(speaker["overloads_per_hour"], 5)
        self.assertAlmostEqual(speaker["from"], TEN[0] / 2, delta=0.0005)
        self.assertAlmostEqual(speaker["to"], TEN[1] / 2, delta=0.0005)
        self.assertAlmostEqual(radio["from"], ONE[0] * 1800, delta=0.1)
        self.assertAlmostEqual(radio["to"], ONE[1] * 1800, delta=1)
        self.assertEqual((line["from"], line["overloads_per_hour"]), (0, 0))
        self.assertAlmostEqual(line["to"], NONE[1] / 2, delta=0.0005)

    def test_without_a_choice_there_are_routes_releases_and_applications(self):
        self.put_three_routes()
        rows = self.rows("top")
        self.assertEqual([(row["by"], row["name"]) for row in rows],
                         [("route", "radio"), ("route", "speaker"), ("route", "line"), ("release", "1.0"),
                          ("release", "1.1"), ("application", "app")])
        for by in ("route", "release", "application"):
            self.assertEqual(sum(row["overloads"] for row in rows if row["by"] == by), 11)
            self.assertEqual(sum(row["play_seconds"] for row in rows if row["by"] == by), 14402)
        self.assertEqual(self.rows("top", "--by", "release"), rows[3:5])
        self.assertEqual(self.rows("top", "--limit", "1"), [rows[0], rows[3], rows[5]])

    def test_the_tables_say_the_same(self):
        self.put_three_routes()
        text = self.ask("top")
        self.assertEqual([line.split() for line in text.split("\n\n")[0].splitlines()], [
            ["ROUTE", "PLAYED", "OVERLOADS", "AN", "HOUR", "FROM", "TO"],
            ["radio", "2.0", "s", "1", "1800", "45.6", "10029"],
            ["speaker", "2", "h", "00", "min", "10", "5", "2.4", "9.2"],
            ["line", "2", "h", "00", "min", "0", "0", "0", "1.84"]])
        self.assertEqual([block.split()[0] for block in text.split("\n\n")], ["ROUTE", "RELEASE", "APPLICATION"])
        self.assertNotIn("ROUTE", self.ask("top", "-q"))
        self.assertIn("\x1b[33m10\x1b[0m", self.ask("top", "--color", "always"))
        self.assertNotIn("\x1b", text)

    def test_a_time_takes_the_hours_that_lie_in_it_also_in_part(self):
        self.put_three_routes()

        def overloads(*arguments):
            return sum(row["overloads"] for row in self.rows("top", "--by", "application", *arguments))

        self.assertEqual(overloads("--since", "2026-11-20 11:00"), 2)
        self.assertEqual(overloads("--since", "2026-11-20 11:59:59"), 2)
        self.assertEqual(overloads("--since", "2026-11-20 12:00"), 1)
        self.assertEqual(overloads("--until", "2026-11-20 12:00"), 10)
        self.assertEqual(overloads("--until", "@1795176000.5"), 11)
        self.assertEqual(overloads("--until", "@1795176000"), 10)
        self.assertEqual(overloads("--since", "2026-11-20 10:00", "--until", "2026-11-20 11:00"), 9)
        self.assertEqual(self.rows("top", "--since", "2027-01-01"), [])

    def test_what_collectors_counted_comes_back_as_the_events_had_it(self):
        truth = self.collect_made_up("--devices", 6, "--ids", 2000, "--repeat", 0.3, "--seed", 11)
        for by in ("route", "release", "application"):
            rows = self.rows("top", "--by", by, "--limit", "1000")
            self.assertEqual(sum(row["overloads"] for row in rows), truth["overloads"])
            self.assertAlmostEqual(sum(row["play_seconds"] for row in rows), truth["play_seconds"], places=6)
            self.assertEqual([row["from"] for row in rows], sorted((row["from"] for row in rows), reverse=True))
        self.assertEqual(
            self.database.ask("SELECT application, count(*) FILTER (WHERE payload ->> 'issue_type' = 'overload') FROM "
                              "(SELECT payload ->> 'HostApplicationDisplayID' AS application, payload FROM events) AS e"
                              " GROUP BY 1 ORDER BY 1"),
            sorted([row["name"], str(row["overloads"])] for row in self.rows("top", "--by", "application")))

    def test_what_has_no_play_has_no_rate_and_no_name_is_a_dash(self):
        self.put_hour(route="", play=0, segments=0, overloads=2)
        row, = self.rows("top", "--by", "route")
        self.assertEqual((row["name"], row["overloads"]), ("", 2))
        self.assertEqual([row[name] for name in ("overloads_per_hour", "from", "to")], [None] * 3)
        self.assertEqual(self.ask("top", "--by", "route", "-q").split(), ["-", "0.0", "s", "2", "-", "-", "-"])

    def test_an_empty_database_has_no_rows(self):
        self.assertEqual(self.ask("top"), "")
        self.assertEqual(self.ask("top", "--json"), "")

    def test_nothing_that_a_terminal_obeys_comes_through(self):
        self.put_hour(application=HOSTILE, route=HOSTILE, release=HOSTILE)
        self.assertEqual([row["name"] for row in self.rows("top")], [HOSTILE] * 3)
        for arguments in (("top",), ("top", "--json")):
            text = self.ask(*arguments)
            self.assertNotIn("\x1b", text)
            self.assertNotIn("\u202e", text)
        self.assertIn("\\u001B[31mred", self.ask("top").replace("\\u001b", "\\u001B"))


if __name__ == "__main__":
    unittest.main()
