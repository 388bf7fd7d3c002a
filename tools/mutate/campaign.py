# SPDX-License-Identifier: Apache-2.0
"""Runs the mutants against the tests that come by them: the quick ones first, then the slow ones, then all."""

import os
import shutil
import subprocess
import tempfile
import threading
from dataclasses import dataclass, field

QUICK_MILLISECONDS = 60
LONGEST_FILTER = 100_000
# No mutant may take the machine's memory with it.
LIMITS = 'ulimit -c 0; ulimit -v 6000000; exec "$@"'


@dataclass
class Program:
    path: str
    filter: str
    milliseconds: dict = field(default_factory=dict)  # by test
    tests_of: dict = field(default_factory=dict)  # by mutant: the tests that come by it
    everywhere: set = field(default_factory=set)


def run(program, tests, mutant, seconds, seed, reached=None):
    """Whether the tests pass, and what they said."""
    folder = tempfile.mkdtemp(prefix="mutant-", dir=os.environ.get("TMPDIR"))
    environment = {**os.environ, "TARN_MUTANT": str(mutant), "TARN_TEST_SEED": str(seed), "TMPDIR": folder}
    if reached:
        environment["TARN_MUTANT_REACHED"] = reached
    words = ["bash", "-c", LIMITS, "mutant", program, "--gtest_brief=1", "--gtest_filter=" + tests]
    words += [] if reached else ["--gtest_fail_fast"]
    child = subprocess.Popen(words, env=environment, cwd=folder, stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                             stdin=subprocess.DEVNULL, start_new_session=True)
    try:
        output = child.communicate(timeout=seconds)[0].decode(errors="replace")
        return child.returncode == 0, output
    except subprocess.TimeoutExpired:
        os.killpg(child.pid, 9)
        child.communicate()
        return False, "took too long"
    finally:
        shutil.rmtree(folder, ignore_errors=True)


def prepare(program, seed, place):
    """The unchanged program must pass; which of its tests come by which mutants, and how long each takes."""
    reached = os.path.join(place, os.path.basename(program.path) + ".reached")
    passed, output = run(program.path, program.filter, 0, 600, seed, reached)
    if not passed:
        raise RuntimeError(f"{os.path.basename(program.path)} fails without any mutant:\n{output[-3000:]}")
    with open(reached, encoding="utf-8") as file:
        for line in file:
            test, milliseconds, *ids = line.split()
            if test == "*":
                program.everywhere |= {int(each) for each in ids}
                continue
            program.milliseconds[test] = int(milliseconds)
            for each in ids:
                program.tests_of.setdefault(int(each), []).append(test)


def stages(program, mutant):
    """Filters of growing cost, each with the time it takes without a mutant."""
    times = program.milliseconds
    tests = program.tests_of.get(mutant.id, [])
    everywhere = mutant.id in program.everywhere
    if not tests and not everywhere:
        return
    quick = [test for test in tests if times[test] <= QUICK_MILLISECONDS]
    slow = [test for test in tests if times[test] > QUICK_MILLISECONDS]
    for some in (quick, slow):
        joined = ":".join(some)
        if some and len(joined) < LONGEST_FILTER:
            yield joined, sum(times[test] for test in some)
    # Tests share a process, so a change may also show in one that doesn't come by it.
    yield program.filter, sum(times.values())


class Campaign:
    def __init__(self, programs, seed, say):
        self.programs, self.seed, self.say = programs, seed, say
        self.lock = threading.Lock()
        self.done = 0

    def fate(self, mutant, total):
        """"caught", "survived", or "not reached"."""
        result = "not reached"
        plans = [(program, *stage) for program in self.programs for stage in stages(program, mutant)]
        # Cheap ones of every program before the whole of any.
        for program, tests, milliseconds in sorted(plans, key=lambda plan: plan[2]):
            result = "survived"
            if not run(program.path, tests, mutant.id, 3 + 8 * milliseconds / 1000, self.seed)[0]:
                result = "caught"
                break
        with self.lock:
            self.done += 1
            if result != "caught":
                self.say(f"{result}: {os.path.basename(mutant.file)}:{mutant.line}: {mutant.change()}")
            if self.done % 100 == 0:
                self.say(f"{self.done} of {total}")
        return result
