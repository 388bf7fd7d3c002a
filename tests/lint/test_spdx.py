# SPDX-License-Identifier: Apache-2.0
"""Tests of the check that every source names its licence."""

import os
import sys
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "tools", "lint"))

import spdx  # noqa: E402
from tree import Tree  # noqa: E402

ONCE = "#pragma once\n"


def found(check, files):
    return [(finding.path, finding.line) for finding in check.check(Tree(files))]


class Spdx(unittest.TestCase):
    SAID = "SPDX-License-Identifier: Apache-2.0\n"

    def test_a_source_that_names_the_licence_is_fine(self):
        self.assertEqual(found(spdx, {
            "a.h": "// " + self.SAID + ONCE, "a.py": "# " + self.SAID, "b.py": "#!/usr/bin/python3\n# " + self.SAID,
            "dev": "#!/bin/sh\n# " + self.SAID, "x/CMakeLists.txt": "# " + self.SAID, "empty/__init__.py": "",
        }), [])

    def test_a_source_that_does_not_is_reported(self):
        files = {"a.c": "int a;\n", "a.h": ONCE + "// " + self.SAID, "b.py": "#!/usr/bin/python3\n",
                 "dev": "#!/bin/sh\n", "x/CMakeLists.txt": "add_library(x)\n", "y.cmake": "set(y)\n",
                 "z.hpp": "# " + self.SAID}
        self.assertEqual(sorted(found(spdx, files)), [(path, 1) for path in sorted(files)])

    def test_documents_and_data_need_none(self):
        self.assertEqual(found(spdx, {"a.md": "# A\n", "a.toml": "a = 1\n", "a.json": "{}\n"}), [])

    def test_the_line_is_written_where_it_is_looked_for(self):
        for path, text in (("a.h", ONCE), ("b.py", "#!/usr/bin/env python3\nimport os\n"), ("dev", "#!/bin/sh\n")):
            self.assertFalse(spdx.lacks(path, spdx.fixed(path, text)))


if __name__ == "__main__":
    unittest.main()
