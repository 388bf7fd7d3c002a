# SPDX-License-Identifier: Apache-2.0
"""The interposed calls do what a campaign asks of them, to a small program of a few lines.

usage: test_shims.py SHIMS
"""

import os
import subprocess
import sys
import tempfile
import time
import unittest

import control
import powercut

SHIMS = sys.argv.pop() if len(sys.argv) > 1 and not sys.argv[-1].startswith("-") else "build/tests/shims"
# Without the interpreter's own start-up: what it does before is only counted.
READS = "import os; f = os.open('/dev/zero', os.O_RDONLY)\nfor n in range(4):\n" \
        "  try: print(len(os.read(f, 1000)))\n  except OSError as e: print(e.errno)"


class Shims(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = folder.name
        self.page = control.Control(os.path.join(self.folder, "control"))

    def run_with(self, name, text, **environment):
        finished = subprocess.run([sys.executable, "-S", "-E", "-c", text], capture_output=True, timeout=60, text=True,
                                  env={**os.environ, **self.page.environment(control.shim(SHIMS, name)), **environment})
        return finished.stdout.split() if finished.returncode == 0 else [finished.stderr[-300:]]

    def reads_before(self):
        """Calls that the interpreter makes by itself, before the program's four."""
        self.assertEqual(self.run_with("faults", READS), ["1000"] * 4)
        count = self.page.calls()["read"] - 4
        self.page.forget()
        return count

    def test_fail_the_call_of_that_number_once(self):
        before = self.reads_before()
        self.page.let_fail("read", before + 2, "EIO")
        self.assertEqual(self.run_with("faults", READS), ["1000", "5", "1000", "1000"])
        self.assertEqual(self.page[control.FIRED], 1)

    def test_fail_a_call_of_one_site(self):
        path = os.path.join(self.folder, "sites")
        self.run_with("faults", READS, TARN_SHIM_SITES=path)
        sites = [site for (kind, site), count in control.sites_in(path).items() if kind == "read" and count == 4]
        self.assertEqual(len(sites), 1)
        self.page.let_fail_at("read", sites[0], 2, "EIO")
        self.assertEqual(self.run_with("faults", READS), ["1000", "5", "1000", "1000"])
        self.assertEqual((self.page[control.FIRED], self.page[control.SITE_CALLS]), (1, 4))

    def test_shorten_a_call(self):
        before = self.reads_before()
        self.page.let_fail("read", before + 3, "short")
        self.assertEqual(self.run_with("faults", READS), ["1000", "1000", "500", "1000"])

    def test_fail_all_calls_of_a_kind_for_a_while(self):
        self.page.let_all_fail(("sync",), "ENOSPC")
        path = os.path.join(self.folder, "file")
        text = f"import os; f = os.open({path!r}, os.O_WRONLY | os.O_CREAT)\nfor n in range(2):\n" \
               "  try: os.fsync(f); print('done')\n  except OSError as e: print(e.errno)"
        self.assertEqual(self.run_with("faults", text), ["28", "28"])
        self.page.let_all_work()
        self.assertEqual(self.run_with("faults", text), ["done", "done"])

    def test_delay_one_synchronisation(self):
        self.page[control.SYNC_DELAY] = 300
        path = os.path.join(self.folder, "file")
        text = f"import os, time; f = os.open({path!r}, os.O_WRONLY | os.O_CREAT); begun = time.monotonic()\n" \
               "os.fdatasync(f); print(time.monotonic() - begun); os.fdatasync(f)"
        took, = map(float, self.run_with("faults", text))
        self.assertGreaterEqual(took, 0.3)
        self.assertEqual((self.page[control.SYNC_DELAY], self.page[control.DELAYS]), (0, 1))

    def test_fail_one_allocation(self):
        self.page[control.FAILING_ALLOCATION] = control.COUNT_ONLY
        self.assertEqual(self.run_with("allocations", "print('alive')"), ["alive"])
        made = self.page[control.ALLOCATIONS]
        self.assertGreater(made, 10)
        self.page[control.ALLOCATIONS] = 0
        self.page[control.FAILING_ALLOCATION] = made // 2
        self.run_with("allocations", "print('alive')")
        self.assertEqual(self.page[control.FIRED], 1)

    def test_fail_several_allocations_in_a_row(self):
        # The program asks for them itself, once it has all that the interpreter needs for that.
        text = "import ctypes, mmap, os, struct\n" \
               "malloc = ctypes.CDLL(None).malloc; malloc.restype = ctypes.c_void_p\n" \
               "page = mmap.mmap(os.open(os.environ['TARN_SHIM_CONTROL'], os.O_RDWR), 512)\n" \
               "got = [0] * 6; places = range(6)\n" \
               "for again in range(2):\n" \
               f"  struct.pack_into('<Q', page, 8 * {control.ALLOCATIONS}, 0)\n" \
               f"  struct.pack_into('<Q', page, 8 * {control.FAILURES_IN_A_ROW}, 3)\n" \
               f"  struct.pack_into('<Q', page, 8 * {control.FAILING_ALLOCATION}, 2)\n" \
               "  for n in places: got[n] = malloc(8)\n" \
               f"  struct.pack_into('<Q', page, 8 * {control.FAILING_ALLOCATION}, 0)\n" \
               "print(*[0 if one is None else 1 for one in got])"
        self.assertEqual(self.run_with("allocations", text), ["1", "0", "0", "0", "1", "1"])
        self.assertEqual(self.page[control.FIRED], 6)

    def test_move_the_wall_clock_alone(self):
        self.page[control.CLOCK_OFFSET] = int(-366 * 86400 * 1e9)
        wall, steady = map(float, self.run_with("clock", "import time; print(time.time(), time.monotonic())"))
        self.assertAlmostEqual(wall, time.time() - 366 * 86400, delta=60)
        self.assertAlmostEqual(steady, time.monotonic(), delta=60)

    def test_write_down_what_is_done_to_files(self):
        root = os.path.join(self.folder, "root")
        os.mkdir(root)
        journal = os.path.join(self.folder, "journal")
        path, outside = os.path.join(root, "a"), os.path.join(self.folder, "outside")
        text = f"import os; o = os.open({outside!r}, os.O_WRONLY | os.O_CREAT); os.write(o, b'no'); os.close(o)\n" \
               f"f = os.open({path!r}, os.O_WRONLY | os.O_CREAT); os.write(f, b'one'); os.write(f, b'two')\n" \
               f"os.fsync(f); os.pwrite(f, b'X', 1); os.ftruncate(f, 5); os.close(f)\n" \
               f"os.rename({path!r}, {path + 'b'!r})"
        self.assertEqual(self.run_with("journal", text, TARN_SHIM_ROOT=root, TARN_SHIM_JOURNAL=journal), [])
        entries = powercut.read_journal(journal)
        self.assertEqual(entries, [
            (powercut.MADE, "a", 0, b""), (powercut.WRITTEN, "a", 0, b"one"), (powercut.WRITTEN, "a", 3, b"two"),
            (powercut.SYNCHRONISED, "a", 0, b""), (powercut.WRITTEN, "a", 1, b"X"), (powercut.CUT, "a", 5, b""),
            (powercut.RENAMED, "a", 0, b"ab")])
        self.assertEqual(self.page[control.SEQUENCE], len(entries))


if __name__ == "__main__":
    unittest.main()
