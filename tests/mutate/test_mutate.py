# SPDX-License-Identifier: Apache-2.0
"""Tests of tools/mutate on a project of one folder: what must be caught is, what must survive is told."""

import contextlib
import io
import os
import shutil
import subprocess
import sys
import tempfile
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "tools", "mutate"))

import folders  # noqa: E402
import mutate  # noqa: E402


class Project(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.root = os.path.realpath(tempfile.mkdtemp(prefix="tarn-mutate-"))
        cls.addClassCleanup(shutil.rmtree, cls.root)
        shutil.copytree(os.path.join(HERE, "project"), cls.root, dirs_exist_ok=True)
        cls.run_or_die("cmake", "-G", "Ninja", "-S", cls.root, "-B", os.path.join(cls.root, "build"))
        folders.FOLDERS.clear()
        folders.FOLDERS["sums"] = ("tests_sums",)
        cls.listed = cls.mutate("sums", "--list")[1]
        cls.status, cls.told = cls.mutate("sums", "--entries")

    @classmethod
    def run_or_die(cls, *words):
        subprocess.run(words, check=True, stdout=subprocess.DEVNULL)

    @classmethod
    def mutate(cls, *words):
        out = io.StringIO()
        with contextlib.redirect_stdout(out), contextlib.redirect_stderr(io.StringIO()):
            status = mutate.main([*words, "--root", cls.root])
        return status, out.getvalue()

    def accept(self, text):
        path = os.path.join(self.root, "tests", "mutants-accepted.toml")
        with open(path, "w", encoding="utf-8") as file:
            file.write(text)
        self.addCleanup(lambda: os.path.exists(path) and os.remove(path))

    def test_a_survivor_is_told_with_its_place_and_fails_the_run(self):
        self.assertEqual(self.status, 1)
        self.assertRegex(self.told, r"(?m)^new +survived +#\d+ sums/Sums\.cpp:13: a < b -> a <= b$")
        self.assertRegex(self.told, r"Sums\.cpp:\d+: made\.reserve\(7\); left out")

    def test_what_only_a_death_test_comes_by_is_caught(self):
        self.assertIn(": std::abort(); left out\n", self.listed)
        self.assertNotIn("std::abort(); left out", self.told)

    def test_what_no_test_comes_by_is_told(self):
        self.assertRegex(self.told, r"(?m)^new +not reached +#\d+ sums/Sums\.cpp:33: number \* 3 -> number / 3$")

    def test_what_the_tests_notice_is_caught(self):
        told = [line for line in self.told.split("\n") if line.startswith("new")]
        for change in ("a < b -> a >= b", 'made.push_back("one"); left out', '"two" -> "Qwo"',
                       "skipsLast -> !(skipsLast)", "number + table[0] -> number - table[0]",
                       "number < 10 -> number <= 10", "10 -> 11",
                       'made.push_back("one"); after made.push_back("two");'):
            with self.subTest(change):
                self.assertIn(f": {change}\n", self.listed)
                if change != "number + table[0] -> number - table[0]":  # of nothing
                    self.assertFalse([line for line in told if line.endswith(": " + change)])

    def test_constants_of_the_compiler_are_built_one_by_one(self):
        self.assertRegex(self.listed, r"Sums\.cpp:8 \(built\): 5 -> 0")
        self.assertNotIn("Sums.cpp:8:", self.told)

    def test_what_does_not_compile_is_dropped_and_counted(self):
        self.assertRegex(self.told, r"[1-9]\d* more don't compile")
        self.assertNotIn("Sums.cpp:9:", self.told)

    def test_the_checkout_is_as_it_was(self):
        for name in ("sums/Sums.cpp", "sums/Sums.h"):
            with open(os.path.join(HERE, "project", name), encoding="utf-8") as before, \
                    open(os.path.join(self.root, name), encoding="utf-8") as after:
                self.assertEqual(before.read(), after.read())

    def test_an_accepted_survivor_is_told_as_such_and_few_of_them_pass(self):
        entries = [entry for entry in self.told.split("[[accepted]]") if "\"a < b -> a <= b\"" in entry]
        self.accept("[[accepted]]" + entries[0].split("reason")[0] + 'reason = "either of two equal ones"\n')
        status, told = self.mutate("sums", "--only", "Sums.cpp")
        self.assertEqual(status, 1)
        self.assertRegex(told, r"(?m)^accepted survived +#\d+ sums/Sums\.cpp:13: a < b -> a <= b$")
        caught = next(line for line in self.listed.split("\n") if line.endswith("a < b -> a >= b"))
        self.assertEqual(self.mutate("sums", "--only", caught.split()[0][1:])[0], 0)

    def test_an_entry_needs_a_reason_and_a_mutant(self):
        entry = '[[accepted]]\nfile = "Sums.cpp"\nline = "return a;"\nchange = "a -> b"\nreason = "{}"\n'
        self.accept(entry.format(" "))
        with self.assertRaisesRegex(ValueError, "without a reason"):
            self.mutate("sums")
        self.accept(entry.format("gone"))
        status, told = self.mutate("sums")
        self.assertEqual(status, 1)
        self.assertIn("stale    accepted, but no such mutant", told)

    def test_tests_that_fail_by_themselves_are_an_error(self):
        path = os.path.join(self.root, "tests", "SumsTest.cpp")
        with open(path, encoding="utf-8") as file:
            text = file.read()
        self.addCleanup(self.put, path, text)
        self.put(path, text.replace("larger(1, 2), 2", "larger(1, 2), 1"))
        with self.assertRaisesRegex(RuntimeError, "fails without any mutant"):
            self.mutate("sums", "--sample", "1")

    @staticmethod
    def put(path, text):
        with open(path, "w", encoding="utf-8") as file:
            file.write(text)


if __name__ == "__main__":
    unittest.main()
