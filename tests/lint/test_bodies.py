# SPDX-License-Identifier: Apache-2.0
"""Tests of tools/lint/bodies.py: where the body of an if and of a loop stands, and what --fix makes of it."""

import os
import subprocess
import sys
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "tools", "lint"))

import bodies  # noqa: E402
from tree import Tree  # noqa: E402


def found(text):
    return [finding.line for finding in bodies.check(Tree({"wire/A.cpp": text}))]


class Bodies(unittest.TestCase):
    RIGHT = (
        "if (a) return;", "if (a) return b(c);", "if constexpr (a) continue;", "if (a) throw B{c};",
        "if (a) return {b, c};", "if (a) {\n  b();\n}", "if (a) {\n  b();\n  return;\n}",
        "if (a) {\n  return;\n} else {\n  b();\n}", "if (a) {\n  b();\n} else if (c) {\n  return;\n}",
        "for (auto a : b) {\n  c(a);\n}", "while (a) {\n  return;\n}", "do {\n  a();\n} while (b);", "while (a) {\n}",
        "if (a) {\n  return;  // why\n}", "if (a) {\n  // why\n  return;\n}", "if (a) return;  // why",
        "if (a) [[unlikely]] {\n  return;\n}", "if (a &&\n    b) {\n  return;\n}",
        "if (a) {\n  return b([] {\n    c();\n  });\n}", '// if (a) b();', 'f("if (a) b();");', "#define A if (a) b();",
        'if (a("//")) return "//";',
    )
    # (what is wrong, what --fix makes of it)
    WRONG = (
        ("if (a) {\n  return b;\n}", "if (a) return b;"),
        ("if (a)\n  return b;", "if (a) return b;"),
        ("if (a) { break; }", "if (a) break;"),
        ('if (a("//")) {\n  return "//";\n}', 'if (a("//")) return "//";'),
        ("if (a) b();", "if (a) {\nb();\n}"),
        ("for (auto a : b) c(a);", "for (auto a : b) {\nc(a);\n}"),
        ("while (a) return;", "while (a) {\nreturn;\n}"),
        ("do a(); while (b); if (c) d();", "do {\na();\n} while (b); if (c) {\nd();\n}"),
        ("if (a) return;\nelse return b;", "if (a) {\nreturn;\n}\nelse {\nreturn b;\n}"),
        ("for (;;) if (a) b();", "for (;;) {\nif (a) {\nb();\n}\n}"),
        ("if (a) return b([] { c(); });", "if (a) {\nreturn b([] { c(); });\n}"),
        ("if (a) [[likely]] return;", "if (a) [[likely]] {\nreturn;\n}"),
    )

    def test_bodies_that_stand_where_they_should_are_fine(self):
        for text in self.RIGHT:
            with self.subTest(text):
                self.assertEqual(found(f"void f() {{\n{text}\n}}\n"), [])

    def test_others_are_reported_on_the_line_of_their_head_and_mended(self):
        for text, mended in self.WRONG:
            with self.subTest(text):
                whole = f"void f() {{\n{text}\n}}\n"
                self.assertIn(2, found(whole))
                self.assertEqual(bodies.fixed(whole), f"void f() {{\n{mended}\n}}\n")

    def test_a_line_of_120_columns_holds_both_and_one_of_121_does_not(self):
        for columns, right, wrong in ((120, "  {} return;", "  {} {{\n    return;\n  }}"),
                                      (121, "  {} {{\n    return;\n  }}", "  {} return;")):
            head = f"if ({'a' * (columns - len('  if () return;'))})"
            self.assertEqual(found(right.format(head)), [])
            self.assertEqual(found(wrong.format(head)), [1])

    def test_clang_format_leaves_both_kinds_as_they_are(self):
        text = "void f() {\n  if (a) return;\n  if (b) {\n    c();\n  }\n  for (;;) {\n    c();\n  }\n}\n"
        run = subprocess.run(["clang-format", "--assume-filename=a.cpp"], input=text, capture_output=True, text=True,
                             cwd=os.path.join(HERE, "..", ".."), check=True)
        self.assertEqual(run.stdout, text)
        self.assertEqual(found(text), [])


if __name__ == "__main__":
    unittest.main()
