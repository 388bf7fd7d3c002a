# SPDX-License-Identifier: Apache-2.0
"""`report` of tarnreporting-fleet with a real database: a page that a strict parser reads, with the numbers that were
put in."""

import os
import re
import subprocess
import sys
import unittest
import xml.etree.ElementTree

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
from asking import ASK, BEGIN, HOSTILE, Asking, environment  # noqa: E402

SPACE = "{http://www.w3.org/1999/xhtml}"


class Page:
    def __init__(self, text):
        self.text, self.root = text, xml.etree.ElementTree.fromstring(text)
        self.tables = {}
        for table in self.root.iter(SPACE + "table"):
            rows = [["".join(cell.itertext()) for cell in row] for row in table.iter(SPACE + "tr")]
            self.tables[table.find(SPACE + "caption").text] = rows

    def facts(self, beginning):
        caption, = [name for name in self.tables if name.startswith(beginning)]
        return dict(self.tables[caption])

    def rows(self, caption):
        """Below the headings."""
        return self.tables[caption][1:]


class Report(Asking):
    def page(self, *arguments):
        return Page(self.ask("report", *arguments))

    def test_the_page_has_the_numbers_that_were_put_in(self):
        self.put_hour(segments=2, play=3600, overloads=4)
        self.put_hour(segments=1, play=3600, overloads=6, keeper=3, release="1.1")
        self.put_hour("2026-11-20 12:00+00", route="line", play=7200)
        self.put_session(1, ended=BEGIN + 60, reason="stopped")
        self.put_session(2, device="bb22")
        self.database.ask("INSERT INTO hour_volume_parts VALUES('2026-11-20 10:00+00', 'app', 'route', '1.0', 3, 0, "
                          "5400), ('2026-11-20 12:00+00', 'app', 'line', '1.0', 9, 1, 1800)")
        self.database.ask("INSERT INTO hour_issue_parts VALUES('2026-11-20 10:00+00', 'overload', 0, 10), "
                          "('2026-11-20 10:00+00', 'silence', 0, 3), ('2026-11-20 12:00+00', 'silence', 1, 9)")
        page = self.page()
        self.assertEqual(page.facts("What was asked of, of all time"), {
            "Devices that had sessions": "2", "Sessions": "2", "Play, h": "4", "Segments of play": "4",
            "Overloads": "10", "Overloads an hour of play": "2.5", "95% interval": "1.2 to 4.6"})
        self.assertEqual(page.rows("The worst routes"), [["route", "2", "3", "10", "5", "2.4 to 9.2"],
                                                         ["line", "2", "1", "0", "0", "0 to 1.84"]])
        self.assertEqual([row[0] for row in page.rows("The worst releases")], ["1.1", "1.0"])
        self.assertEqual(page.rows("The worst applications"), [["app", "4", "4", "10", "2.5", "1.2 to 4.6"]])
        self.assertEqual(page.rows("Each 1 h"), [
            ["2026-11-20 10:00", "2", "10", "5", "2.4 to 9.2"], ["2026-11-20 11:00", "0", "0", "-", "-"],
            ["2026-11-20 12:00", "2", "0", "0", "0 to 1.84"]])
        self.assertEqual([row[1:] for row in page.rows("Volume")],
                         [["1.5", "75"] if tenth == 3 else ["0.5", "25"] if tenth == 9 else ["0", "0"]
                          for tenth in range(10)])
        self.assertEqual(page.rows("Issues by type"), [["silence", "12"], ["overload", "10"]])
        # A part of it: the hours, the sessions and the issues, and never the account.
        page = self.page("--since", "2026-11-20 12:00", "--until", "2026-11-20 13:00")
        facts = page.facts("What was asked of, from 2026-11-20 12:00:00 to 2026-11-20 13:00:00")
        self.assertEqual((facts["Play, h"], facts["Overloads"], facts["Sessions"]), ("2", "0", "1"))
        self.assertEqual(page.rows("Issues by type"), [["silence", "9"]])
        self.assertEqual(page.facts("Records")["Devices"], "2")

    def test_the_account_is_the_same_by_counts_and_of_the_events(self):
        truth = self.collect_made_up("--devices", 6, "--ids", 1500, "--repeat", 0.3, "--seed", 13)
        wanted = {"Devices": "6", "Made": str(truth["made"]), "Stored": str(truth["events"]),
                  "Gone before they could leave": str(truth["gaps"]), "Left out on the device": str(truth["left_out"]),
                  "Missing": "0", "Not told of yet": "0", "Messages refused": "0"}
        page, exact = self.page(), self.page("--exact")
        self.assertEqual(page.facts("Records, by the collectors' counts"), wanted)
        self.assertEqual(exact.facts("Records, made of the events"), wanted)
        self.assertEqual(page.facts("What was asked of")["Overloads"], str(truth["overloads"]))
        self.assertAlmostEqual(float(page.facts("What was asked of")["Play, h"]), truth["play_seconds"] / 3600, 3)
        # A day that was dropped is still in the counts, and one that never came is missing.
        self.database.ask("SELECT forget_a_day_before('2026-11-19')")
        self.database.ask("UPDATE told SET last = last + 5 WHERE (device, last) = (SELECT device, max(last) FROM told "
                          "GROUP BY device ORDER BY device LIMIT 1)")
        wanted.update({"Made": str(truth["made"] + 5), "Missing": "5"})
        self.assertEqual(self.page().facts("Records"), wanted)
        self.assertEqual(self.page("--exact").facts("Records"), wanted)

    def test_ids_that_are_two_things_are_told(self):
        self.collect_made_up("--devices", 1, "--ids", 300, "--seed", 14)
        self.database.ask("INSERT INTO events SELECT device, 0, id, time + interval '1 second', NULL, backend, name, "
                          "payload, detail FROM events ORDER BY id LIMIT 3; UPDATE stored_parts SET records = records "
                          "+ 3")
        self.assertIn("3 ids seem to be more than one thing", self.page().text)
        self.assertIn("3 records are of stores that another one replaced", self.page("--exact").text)

    def test_a_long_time_is_drawn_in_days_and_nothing_is_lost_of_it(self):
        self.database.ask("INSERT INTO hour_parts SELECT h, 'app', 'route', '1.0', 0, 1, 1800, 1 FROM generate_series("
                          "'2026-01-01 05:00+00'::timestamptz, '2026-12-31 20:00+00', '1 hour') AS h")
        hours = self.database.number("SELECT count(*) FROM hour_parts")
        page = self.page()
        rows = page.rows("Each 7 d")
        self.assertLessEqual(len(rows), 62)
        self.assertEqual(sum(float(row[1]) for row in rows), hours / 2)
        self.assertEqual(sum(int(row[2]) for row in rows), hours)

    def test_only_the_worst_ten_are_shown_and_other_issues_together(self):
        for number in range(12):
            self.put_hour(application=f"app{number:02}", overloads=number)
        self.database.ask("INSERT INTO hour_issue_parts SELECT '2026-11-20 10:00+00', 'type' || n, 0, 100 - n FROM "
                          "generate_series(1, 25) AS n")
        page = self.page()
        self.assertEqual([row[0] for row in page.rows("The worst applications")],
                         [f"app{number:02}" for number in range(11, 1, -1)])
        self.assertEqual(len(page.rows("Issues by type")), 21)
        self.assertEqual(page.rows("Issues by type")[-1], ["5 others", str(sum(100 - n for n in range(21, 26)))])

    def test_an_empty_database_has_a_page_too(self):
        page = self.page()
        self.assertEqual(page.facts("Records")["Made"], "0")
        self.assertEqual(page.text.count("Nothing was played."), 4)
        self.assertIn("No device told of any.", page.text)

    def test_names_are_nothing_but_text_in_it(self):
        self.put_hour(application=HOSTILE, route=HOSTILE, release=HOSTILE, overloads=1)
        self.database.ask("INSERT INTO hour_issue_parts VALUES('2026-11-20 10:00+00', '</style><b>&x', 0, 1)")
        page = self.page()
        self.assertEqual([element.tag for element in page.root.iter(SPACE + "script")], [])
        self.assertNotIn("<script", page.text)
        self.assertNotIn("<b>", page.text)
        self.assertIsNone(re.search("[\x00-\x08\x0b-\x1f\u202e]", page.text))
        self.assertTrue(page.rows("The worst routes")[0][0].startswith("</td><script>alert(1)</script>"))
        self.assertEqual(page.rows("Issues by type"), [["</style><b>&x", "1"]])
        # Nothing is fetched from anywhere.
        self.assertNotIn("http", re.sub(r"http://www.w3.org/|http-equiv", "", page.text))

    def test_a_file_is_replaced_whole_or_stays(self):
        path = os.path.join(self.folder, "page.html")
        with open(path, "w", encoding="utf-8") as file:
            file.write("old")
        self.assertEqual(self.ask("report", "-o", path), "")
        with open(path, encoding="utf-8") as file:
            Page(file.read())
        self.assertEqual([name for name in os.listdir(self.folder) if name.startswith("page")], ["page.html"])
        self.assertIn("can't write", self.ask("report", "-o", os.path.join(self.folder, "none", "page"), status=1))
        self.database.end()
        before = os.stat(path)
        self.ask("report", "-o", path, status=69)
        self.assertEqual(os.stat(path), before)

    def test_a_reader_who_has_had_enough_is_no_failure(self):
        reading, writing = os.pipe()
        os.close(reading)
        done = subprocess.run([ASK, "report", "--db", self.database.url], stdout=writing, stderr=subprocess.PIPE,
                              check=False, timeout=60, env=environment())
        os.close(writing)
        self.assertEqual((done.returncode, done.stderr), (0, b""))


if __name__ == "__main__":
    unittest.main()
