# SPDX-License-Identifier: Apache-2.0
"""Builds programs of others against an installed libtarnreporting: C, C++ and a plug-in, found by pkg-config and by
CMake; and looks at what the library itself needs and shows.

usage: installed.py BUILD LIBDIR SYMBOLS C_COMPILER CXX_COMPILER
"""

import os
import re
import shutil
import subprocess
import sys
import tempfile
import unittest

BUILD, LIBDIR, SYMBOLS, CC, CXX = sys.argv[1:6]
ABI = SYMBOLS.replace(".symbols.txt", ".abi")
HEADERS = os.path.join(os.path.dirname(SYMBOLS), "include")
ABI_OPTIONS = ("--exported-interfaces-only", "--drop-private-types")
SOURCES = os.path.join(os.path.dirname(os.path.abspath(__file__)), "outside")


def run(*command, **options):
    return subprocess.run(command, capture_output=True, text=True, stdin=subprocess.DEVNULL, **options)


class InstalledLibrary(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.mkdtemp(prefix="tarn-clients-")
        cls.addClassCleanup(shutil.rmtree, cls.folder)
        cls.prefix = os.path.join(cls.folder, "prefix")
        done = run("cmake", "--install", os.path.join(BUILD, "clients"), "--prefix", cls.prefix)
        assert done.returncode == 0, done.stdout + done.stderr
        cls.libraries = os.path.join(cls.prefix, LIBDIR)
        cls.library = os.path.join(cls.libraries, "libtarnreporting.so.1")
        cls.environment = {**os.environ, "PKG_CONFIG_PATH": os.path.join(cls.libraries, "pkgconfig"),
                           "LD_LIBRARY_PATH": cls.libraries, "TARNREPORTING_SOCKET": os.path.join(cls.folder, "none")}

    def flags(self):
        done = run("pkg-config", "--cflags", "--libs", "tarnreporting", env=self.environment)
        self.assertEqual(done.returncode, 0, done.stderr)
        return done.stdout.split()

    def build_and_run(self, compiler, *words):
        program = os.path.join(self.folder, "program")
        done = run(compiler, "-Wall", "-Wextra", "-Wpedantic", "-Werror", *words, "-o", program, *self.flags())
        self.assertEqual(done.returncode, 0, done.stderr)
        done = run(program, env=self.environment)
        self.assertEqual((done.returncode, done.stdout), (0, "posted 2, left 2\n"), done.stderr)

    def test_a_c11_program_builds_and_posts(self):
        self.build_and_run(CC, "-std=c11", os.path.join(SOURCES, "program.c"))

    def test_the_c_program_is_a_cxx_program_too(self):
        # {0} is how C says it.
        self.build_and_run(CXX, "-std=c++17", "-Wno-missing-field-initializers", "-x", "c++",
                           os.path.join(SOURCES, "program.c"), "-x", "none")

    def test_a_cxx17_program_builds_and_posts(self):
        self.build_and_run(CXX, "-std=c++17", os.path.join(SOURCES, "program.cpp"))

    def test_a_plug_in_is_loaded_used_and_unloaded(self):
        plugin = os.path.join(self.folder, "plugin.so")
        done = run(CC, "-std=c11", "-shared", "-fPIC", os.path.join(SOURCES, "plugin.c"), "-o", plugin, *self.flags())
        self.assertEqual(done.returncode, 0, done.stderr)
        host = os.path.join(self.folder, "host")
        done = run(CC, "-std=c11", os.path.join(SOURCES, "host.c"), "-o", host, "-ldl")
        self.assertEqual(done.returncode, 0, done.stderr)
        done = run(host, plugin, env=self.environment)
        self.assertEqual((done.returncode, done.stdout), (0, "posted 3 times\n"), done.stderr)

    def test_cmake_finds_it(self):
        build = os.path.join(self.folder, "cmake")
        for step in (("-S", SOURCES, "-B", build, f"-DCMAKE_PREFIX_PATH={self.prefix}", f"-DCMAKE_C_COMPILER={CC}",
                      f"-DCMAKE_CXX_COMPILER={CXX}"), ("--build", build)):
            done = run("cmake", *step)
            self.assertEqual(done.returncode, 0, done.stdout + done.stderr)
        for program in ("c_program", "cxx_program"):
            done = run(os.path.join(build, program), env=self.environment)
            self.assertEqual((done.returncode, done.stdout), (0, "posted 2, left 2\n"), done.stderr)

    def test_it_needs_the_c_library_alone_and_tells_its_name(self):
        dynamic = run("readelf", "-d", self.library).stdout
        self.assertEqual(re.findall(r"NEEDED.*\[(.*)\]", dynamic), ["libc.so.6"])
        self.assertEqual(re.findall(r"SONAME.*\[(.*)\]", dynamic), ["libtarnreporting.so.1"])

    def test_it_shows_the_symbols_of_the_committed_list_and_no_other(self):
        lines = run("nm", "-D", "--defined-only", self.library).stdout.splitlines()
        shown = sorted(line.split()[-1] for line in lines if " A " not in line)
        with open(SYMBOLS, encoding="utf-8") as file:
            self.assertEqual(shown, file.read().split())

    def test_its_interface_is_that_of_the_committed_file(self):
        if shutil.which("abidiff") is None:
            self.skipTest("there is no abidiff")
        built = os.path.join(BUILD, "clients", "c", "libtarnreporting.so.1")  # installed, it may have lost its types
        done = run("abidiff", *ABI_OPTIONS, "--headers-dir2", HEADERS, ABI, built)
        self.assertEqual(done.returncode, 0, done.stdout + done.stderr + "\nWhere this is meant: abidw "
                         f"{' '.join(ABI_OPTIONS)} --headers-dir clients/c/include --no-comp-dir-path --no-corpus-path"
                         f" --no-show-locs {built} --out-file clients/c/tarnreporting.abi")

    def test_a_change_of_the_interface_is_seen(self):
        if shutil.which("abidiff") is None:
            self.skipTest("there is no abidiff")
        with open(ABI, encoding="utf-8") as file:
            text = file.read()
        narrow = re.search(r"type-id='([^']+)' name='timeout_ms'", text)[1]
        changed = os.path.join(self.folder, "changed.abi")
        with open(changed, "w", encoding="utf-8") as file:
            file.write(re.sub(r"type-id='[^']+' name='stamp_ns'", f"type-id='{narrow}' name='stamp_ns'", text))
        built = os.path.join(BUILD, "clients", "c", "libtarnreporting.so.1")
        self.assertNotEqual(run("abidiff", *ABI_OPTIONS, "--headers-dir2", HEADERS, changed, built).returncode, 0)

    def test_nothing_runs_when_it_is_loaded(self):
        sections = run("readelf", "-WS", self.library).stdout
        # The compiler's own start file has one entry of eight bytes; a global constructor would be a second.
        size = re.search(r"\.init_array\s+\S+\s+\S+\s+\S+\s+([0-9a-f]+)", sections)
        self.assertEqual(int(size.group(1), 16), 8)


unittest.main(argv=sys.argv[:1], verbosity=2)  # tells why one was skipped
