# SPDX-License-Identifier: Apache-2.0
"""tarnreporting-collect with a real database, from files: what is stored, once each, whatever comes twice or is odd."""

import os
import subprocess
import sys
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
from collecting import Collecting, produce  # noqa: E402


class Database(Collecting):
    def messages(self, *arguments):
        self.files = os.path.join(self.folder, "files")
        os.makedirs(self.files, exist_ok=True)
        return produce("--folder", self.files, *arguments)

    def test_the_layout_is_applied_once_however_many_ask_for_it(self):
        asked = [subprocess.Popen(self.command("--migrate"), stderr=subprocess.PIPE, text=True) for _ in range(4)]
        texts = [each.communicate()[1] for each in asked]
        self.assertEqual([each.returncode for each in asked], [0] * 4, texts)
        self.assertEqual(sorted(int(text.split()[1]) for text in texts)[:3], [0, 0, 0], texts)
        self.assertEqual(self.database.ask("SELECT version, name FROM schema_versions ORDER BY 1"),
                         [["1", "001_tables"], ["2", "002_views"], ["3", "003_questions"], ["4", "004_places"]])

    def test_a_layout_that_is_old_or_later_than_known_is_told(self):
        os.makedirs(os.path.join(self.folder, "none"))
        none = os.path.join(self.folder, "none")
        self.assertIn("--migrate", self.collect("--keep-layout", "--from", none, status=1))
        self.collect("--migrate")
        self.collect("--keep-layout", "--from", none)
        self.database.ask("INSERT INTO schema_versions(version, name) VALUES(99, 'later')")
        self.assertIn("version 99", self.collect("--from", none, status=1))
        self.assertIn("version 99", self.collect("--migrate", status=1))

    def test_what_comes_is_stored_once_each_and_again_it_changes_nothing(self):
        truth = self.messages("--devices", 8, "--ids", 1500, "--repeat", 0.4, "--seed", 1)
        self.collect("--from", self.files)
        self.assert_even(truth)
        self.assert_hours_by_key()
        whole = "SELECT md5(string_agg(t::text, '' ORDER BY t::text)) FROM "
        tables = ("events", "runs", "sessions", "periods", "gaps", "told", "hours", "hour_volumes")
        before = [self.database.ask(whole + table + " AS t") for table in tables]
        self.assertIn(" 0 were new", self.collect("--from", self.files))
        self.assertEqual([self.database.ask(whole + table + " AS t") for table in tables], before)

    def test_two_at_once_with_the_same_messages_store_each_once(self):
        truth = self.messages("--devices", 8, "--ids", 3000, "--repeat", 0.2, "--seed", 2)
        both = [subprocess.Popen(self.command("--from", self.files), stderr=subprocess.PIPE, text=True)
                for _ in range(2)]
        texts = [each.communicate()[1] for each in both]
        self.assertEqual([each.returncode for each in both], [0, 0], texts)
        self.assert_even(truth)
        self.assert_hours_by_key()

    def test_of_two_states_of_a_session_the_later_look_counts(self):
        self.messages("--devices", 4, "--ids", 1000, "--repeat", 0.5, "--seed", 3)
        self.collect("--from", self.files)
        # All but the last session, of which no later look told.
        self.assertEqual(self.database.ask("SELECT DISTINCT id FROM sessions WHERE ended IS NULL"), [["21"]])
        self.assertEqual(self.database.number(
            "SELECT count(*) FROM sessions AS s JOIN periods AS p ON p.run = s.run AND p.session = s.id WHERE (s.ended "
            "IS NULL) <> (p.stopped IS NULL) OR s.end_reason <> 'stopped'"), 0)

    def test_days_are_partitions_also_late_ones(self):
        self.messages("--devices", 6, "--ids", 1000, "--seed", 4)
        self.collect("--from", self.files)
        wrong = self.database.ask("SELECT DISTINCT tableoid::regclass FROM events WHERE tableoid::regclass::text <> "
                                  "'events_' || to_char(time AT TIME ZONE 'UTC', 'YYYYMMDD')")
        self.assertEqual(wrong, [])
        self.assertGreaterEqual(self.database.number("SELECT count(DISTINCT tableoid) FROM events"), 6)

    def test_a_day_that_was_dropped_is_neither_stored_nor_counted_again(self):
        truth = self.messages("--devices", 6, "--ids", 1000, "--repeat", 0.3, "--seed", 5)
        self.collect("--from", self.files)
        before = self.account()
        self.assertEqual(len(self.database.ask(
            "SELECT forget_a_day_before('2026-11-19') FROM generate_series(1, 3)")), 3)
        kept = self.database.number("SELECT count(*) FROM events")
        self.assertLess(kept, truth["events"])
        self.assertEqual(self.account(), before)
        self.collect("--from", self.files)
        self.assertEqual(self.database.number("SELECT count(*) FROM events"), kept)
        self.assertEqual(self.account(), before)
        self.assert_hours(truth)

    def test_what_nothing_can_be_made_of_is_kept_apart_and_holds_nothing_up(self):
        truth = self.messages("--devices", 2, "--ids", 600, "--seed", 6, "--odd")
        told = self.collect("--from", self.files)
        self.assertEqual(told.count("refused: "), 2, told)
        refused = self.database.ask("SELECT why, length(bytes) > 0 FROM refused ORDER BY why")
        self.assertEqual([row[1] for row in refused], ["t", "t"])
        self.assertIn("invalid input syntax for type json", refused[0][0])
        self.assertEqual(refused[1][0], "it isn't a message of a fleet")
        self.assertEqual(self.database.ask("SELECT name, payload FROM events WHERE name LIKE 'na%'"),
                         [["na\ufffdme\ufffd", '{"a": "\ufffd\ufffdx"}']])
        self.assertEqual(self.database.number("SELECT count(*) FROM events"), truth["events"] + 1)
        self.collect("--from", self.files)
        self.assertEqual(self.database.number("SELECT count(*) FROM refused"), 2)

    def test_the_derived_views_answer(self):
        truth = self.messages("--devices", 2, "--ids", 600, "--seed", 7)
        self.collect("--from", self.files)
        self.assertEqual(self.database.number("SELECT sum(play_seconds) FROM v_volume"), truth["play_seconds"])
        self.assertEqual(self.database.number("SELECT count(*) FROM v_issues WHERE issue_type = 'overload'"),
                         truth["overloads"])
        self.assertGreater(self.database.number("SELECT count(*) FROM v_messages WHERE audiotag = 'PlaybackStart'"), 0)
        for view in ("v_input", "v_group", "v_summaries", "v_drivers"):
            self.assertEqual(self.database.number(f"SELECT count(*) FROM {view}"), 0)


if __name__ == "__main__":
    unittest.main()
