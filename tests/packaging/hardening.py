# SPDX-License-Identifier: Apache-2.0
"""What is built is hardened, and tells nothing of where it was built: read from the files themselves. And whoever
builds it in the plain way gets the same, without warnings as errors.

usage: hardening.py --source DIR --compiler CXX FILE...
"""

import argparse
import json
import os
import re
import subprocess
import sys
import tempfile
import unittest

options = argparse.Namespace()


def readelf(what, path):
    done = subprocess.run(["readelf", "--wide", what, path], capture_output=True, text=True, check=True,
                          env={**os.environ, "LC_ALL": "C"})
    return done.stdout


def missing(path, source):
    """What this program or shared library lacks, in words."""
    dynamic = readelf("--dynamic", path)
    symbols = set(re.findall(r"\bUND\s+(\w+)", readelf("--dyn-syms", path)))
    checked = {name for name in symbols if name.endswith("_chk") and name != "__stack_chk_fail"}
    with open(path, "rb") as file:
        names_source = os.fsencode(source) in file.read()
    is_program = "INTERP" in readelf("--program-headers", path)
    lacks = {
        "position-independent code": not re.search(r"Type:\s+DYN\b", readelf("--file-header", path)),
        "binding at the start": "BIND_NOW" not in dynamic and not re.search(r"\(FLAGS_1\).*\bNOW\b", dynamic),
        "tables that become read-only": "GNU_RELRO" not in readelf("--program-headers", path),
        "guarded stack frames": "__stack_chk_fail" not in symbols,
        # A library may have no call that has a checked form.
        "checked forms of the C library's calls": is_program and not checked,
        "silence about the source's folder": names_source,
    }
    return [what for what, is_lacking in lacks.items() if is_lacking]


class Hardening(unittest.TestCase):
    def test_everything_that_is_built_has_all_of_it(self):
        self.assertGreaterEqual(len(options.files), 3)
        for path in options.files:
            with self.subTest(path):
                self.assertEqual(missing(path, options.source), [])

    def test_a_program_without_any_of_it_is_seen(self):
        with tempfile.TemporaryDirectory() as folder:
            path = os.path.join(folder, "plain")
            with open(path + ".cpp", "w", encoding="utf-8") as file:
                file.write('#include <cstdio>\nint main() { char text[64]; return std::fgets(text, 64, stdin) '
                           '== nullptr ? std::puts(__FILE__) : 0; }\n')
            subprocess.run([options.compiler, "-O0", "-g", "-U_FORTIFY_SOURCE", "-fno-stack-protector", "-fno-pie",
                            "-no-pie", "-Wl,-z,norelro,-z,lazy", path + ".cpp", "-o", path], check=True)
            self.assertEqual(missing(path, folder), [
                "position-independent code", "binding at the start", "tables that become read-only",
                "guarded stack frames", "checked forms of the C library's calls",
                "silence about the source's folder"])

    def test_a_plain_configuration_is_hardened_and_lets_warnings_be(self):
        with tempfile.TemporaryDirectory() as folder:
            subprocess.run(["cmake", "-G", "Ninja", "-S", options.source, "-B", folder, "-DTARN_TESTS=OFF",
                            f"-DCMAKE_CXX_COMPILER={options.compiler}"], check=True, capture_output=True)
            with open(os.path.join(folder, "compile_commands.json"), encoding="utf-8") as file:
                commands = [entry["command"].split() for entry in json.load(file)]
        self.assertGreater(len(commands), 100)
        for command in commands:
            self.assertNotIn("-Werror", command)
            for flag in ("-O2", "-D_FORTIFY_SOURCE=3", "-fstack-protector-strong", "-fstack-clash-protection"):
                self.assertIn(flag, command)


if __name__ == "__main__":
    parser = argparse.ArgumentParser()
    parser.add_argument("--source", required=True)
    parser.add_argument("--compiler", required=True)
    parser.add_argument("files", nargs="+")
    options = parser.parse_args()
    unittest.main(argv=sys.argv[:1])
