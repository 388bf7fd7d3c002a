# SPDX-License-Identifier: Apache-2.0
"""tarnreporting-fleet where its database isn't as it is to be, or nobody reads on: what it says, and its status."""

import os
import subprocess
import sys
import unittest

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
from asking import ASK, Asking, environment  # noqa: E402

QUESTIONS = ("top", "sessions")


class Places(Asking):
    layout = False

    def test_what_is_wrong_with_the_layout_is_told_and_what_brings_it_up_to_date(self):
        for question in QUESTIONS:
            text = self.ask(question, status=1)
            self.assertTrue(text.startswith("tarnreporting-fleet: database: it has no tables"), text)
            self.assertIn("tarnreporting-collect --migrate", text)
        self.collect("--migrate")
        self.database.ask("DELETE FROM schema_versions WHERE version > 2")
        for question in QUESTIONS:
            self.assertIn("its layout is version 2", self.ask(question, status=1))
        self.database.ask("INSERT INTO schema_versions(version, name) VALUES(99, 'later')")
        self.assertIn("its layout is version 99", self.ask("top", status=1))

    def test_a_database_that_cannot_be_reached_is_69(self):
        self.database.end()
        for question in QUESTIONS:
            text = self.ask(question, status=69)
            self.assertTrue(text.startswith("tarnreporting-fleet: database: "), text)
            self.assertEqual(text.count("\n"), 1, text)
        self.ask("top", status=69, database="postgresql://127.0.0.1:1/none")

    def test_one_that_is_not_there_is_69_too(self):
        text = self.ask("top", status=69, database=self.database.url.replace("dbname=postgres", "dbname=none"))
        self.assertIn('"none"', text)

    def test_wrong_usage_is_64(self):
        self.assertIn("--db", self.ask("top", status=64, database="host=a nonsense=b"))
        self.assertIn("--db", self.ask("top", status=64, database="postgresql://[::1/none"))
        self.assertIn("no time", self.ask("top", "--since", "noon", status=64))
        self.assertIn("not after", self.ask("sessions", "--since", "@9", "--until", "@9", status=64))
        self.assertIn("--limit", self.ask("sessions", "--limit", "0", status=64))
        done = subprocess.run([ASK], capture_output=True, text=True, check=False, env=environment())
        self.assertEqual((done.returncode, done.stdout), (64, ""))

    def test_somebody_who_may_only_read_can_ask_and_others_are_told(self):
        self.collect("--migrate")
        self.put_hour()
        self.database.ask("CREATE ROLE reader LOGIN; GRANT pg_read_all_data TO reader; CREATE ROLE nobody LOGIN")
        self.assertIn("route", self.ask("top", database=self.database.url.replace("user=fleet", "user=reader")))
        text = self.ask("top", status=1, database=self.database.url.replace("user=fleet", "user=nobody"))
        self.assertIn("permission denied", text)

    def test_it_changes_nothing_and_the_server_sees_to_that(self):
        self.collect("--migrate")
        self.put_hour()
        # Whoever is asked tries to write.
        self.database.ask("""
            CREATE TABLE touched(at timestamptz);
            CREATE FUNCTION touch() RETURNS timestamptz LANGUAGE plpgsql AS
              $$ BEGIN INSERT INTO touched VALUES(now()); RETURN now(); END $$;
            ALTER TABLE hour_parts RENAME TO kept;
            CREATE VIEW hour_parts AS SELECT * FROM kept WHERE touch() IS NOT NULL""")
        self.assertIn("read-only", self.ask("top", status=1))
        self.assertEqual(self.database.number("SELECT count(*) FROM touched"), 0)

    def test_a_reader_who_has_had_enough_is_no_failure(self):
        self.collect("--migrate")
        self.put_hour()
        self.put_session(1)
        for question in QUESTIONS:
            for form in ((), ("--json",)):
                with self.subTest(question=question, form=form):
                    reading, writing = os.pipe()
                    os.close(reading)
                    done = subprocess.run([ASK, question, *form, "--db", self.database.url], stdout=writing,
                                          stderr=subprocess.PIPE, check=False, timeout=60, env=environment())
                    os.close(writing)
                    self.assertEqual((done.returncode, done.stderr), (0, b""))
                    with open("/dev/full", "w", encoding="utf-8") as full:
                        done = subprocess.run([ASK, question, *form, "--db", self.database.url], stdout=full,
                                              stderr=subprocess.PIPE, text=True, check=False, timeout=60,
                                              env=environment())
                    self.assertEqual(done.returncode, 1)
                    self.assertIn("can't write", done.stderr)


if __name__ == "__main__":
    unittest.main()
