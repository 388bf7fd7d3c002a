# SPDX-License-Identifier: Apache-2.0
"""Builds a folder's mutated sources in build/mutate/FOLDER and links them into copies of its test programs.

The checkout is never written to. The mutated objects stand before all others, so that what inline functions of headers
do is theirs too.
"""

import json
import os
import re
import shlex
import shutil
import subprocess
from concurrent.futures import ThreadPoolExecutor

import schemata

HERE = os.path.dirname(os.path.abspath(__file__))
# The mutants need neither speed nor the warnings of the true build.
LAX = ["-w", "-O1", "-g0", "-fpermissive"]
MESSAGE = re.compile(r"^(.+?):(\d+):(\d+):\s+(?:fatal )?(error|note|required from)\b", re.MULTILINE)
MOST_ROUNDS = 12


class Builder:
    def __init__(self, root, build, folder, jobs):
        self.root, self.build, self.jobs = root, build, jobs
        self.place = os.path.join(build, "mutate", folder)
        self.tree = os.path.join(self.place, "tree")
        self.headers = set()  # that hold mutants
        self.made = set()  # the tests' objects that were compiled with them
        with open(os.path.join(build, "compile_commands.json"), encoding="utf-8") as file:
            self.commands = {os.path.realpath(entry["file"]): entry for entry in json.load(file)}

    def arguments(self, source):
        """What clang needs to read the source as the compiler does."""
        words = shlex.split(self.commands[source]["command"])
        kept = [word for word in words if word.startswith(("-I", "-D", "-std", "-isystem"))]
        for at, word in enumerate(words):
            if word == "-isystem":
                kept.append(words[at + 1])
        return kept

    def object_of(self, source):
        return os.path.join(self.place, "objects", os.path.relpath(source, self.root).replace(os.sep, "_") + ".o")

    def copy_of(self, path):
        return os.path.join(self.tree, os.path.relpath(path, self.root))

    def compile(self, source, copy, output):
        """What the compiler says when it fails; nothing when it doesn't."""
        entry = self.commands[source]
        words = [word for word in shlex.split(entry["command"]) if word != "-Werror"]
        words[words.index("-o") + 1] = output
        words[words.index("-c") + 1] = copy
        at = words.index("-o")
        words[at:at] = [*LAX, "-include", os.path.join(HERE, "selector.h")]
        first = next(at for at, word in enumerate(words) if word.startswith("-") and at > 0)
        words.insert(first, "-I" + self.tree)
        if shutil.which("ccache") and "ccache" not in words[0]:
            words.insert(0, "ccache")  # the tests' objects stay the same from run to run
        done = subprocess.run(words, cwd=entry["directory"], capture_output=True, text=True, errors="replace",
                              check=False, env={**os.environ, "LC_ALL": "C"})
        return done.stdout + done.stderr if done.returncode != 0 else ""

    def write(self, path, text):
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, "w", encoding="utf-8", newline="") as file:
            file.write(text)

    def mutated(self, files, sources, mutants, say):
        """Compiles all sources with these run-time mutants in them; returns those that don't compile."""
        dropped = []
        os.makedirs(os.path.join(self.place, "objects"), exist_ok=True)
        todo = list(sources)
        for turn in range(MOST_ROUNDS):
            alive = {}
            gone = {mutant.id for mutant in dropped}
            for mutant in mutants:
                if mutant.id not in gone:
                    alive.setdefault(mutant.file, []).append(mutant)
            for path, text in files.items():
                self.write(self.copy_of(path), schemata.rewritten(text, alive.get(path, [])))
            with ThreadPoolExecutor(self.jobs) as pool:
                outputs = list(pool.map(lambda each: self.compile(each, self.copy_of(each), self.object_of(each)),
                                        todo))
            failed = [(source, output) for source, output in zip(todo, outputs) if output]
            if not failed:
                self.headers = {path for path in alive if not path.endswith(".cpp")}
                return dropped
            bad = set()
            for _, output in failed:
                bad |= self.culprits(output, alive, turn >= MOST_ROUNDS // 2)
            if not bad:
                raise RuntimeError("a mutated source doesn't compile, for no mutant's sake:\n" + failed[0][1][:4000])
            dropped += [mutant for mutant in mutants if mutant.id in bad]
            say(f"{len(bad)} mutants don't compile; once more without them")
            headers = any(mutant.id in bad and not mutant.file.endswith(".cpp") for mutant in mutants)
            todo = list(sources) if headers else [source for source, _ in failed]
        raise RuntimeError("the mutated sources don't compile:\n" + failed[0][1][:4000])

    def culprits(self, output, alive, whole_line):
        """The mutants that the compiler's errors point at; where an error points at none, those of its notes."""
        found = set()
        blamed = True
        for path, line, column, what in MESSAGE.findall(output):
            if what == "note" and blamed:
                continue
            here = self.asked_at(os.path.realpath(os.path.join(self.build, path)), int(line), int(column), whole_line)
            found |= here
            blamed = bool(here) or (blamed and what == "note")
        if not found and whole_line:
            found = {mutant.id for mutants in alive.values() for mutant in mutants
                     if self.copy_of(mutant.file) in output}
        return found

    def asked_at(self, path, line, column, whole_line):
        if not path.startswith(os.path.realpath(self.tree) + os.sep):
            return set()
        with open(path, encoding="utf-8") as file:
            text = file.read().split("\n")[line - 1]
        if whole_line:
            return {int(each) for each in re.findall(schemata.ASK + r"\((\d+)\)", text)}
        mutant = schemata.asked_before(text, column)
        return set() if mutant is None else {mutant}

    def selector(self):
        output = os.path.join(self.place, "selector.o")
        self.must(["c++", "-std=c++20", "-O1", "-I" + os.path.dirname(os.path.dirname(HERE)), "-c",
                   os.path.join(HERE, "selector.cpp"), "-o", output])
        return output

    def with_mutated_headers(self, name):
        """The test's object, compiled anew when it includes a header that holds mutants: it may be inline there."""
        known = subprocess.run(["ninja", "-C", self.build, "-t", "deps", name], check=True, capture_output=True,
                               text=True).stdout.split()
        known = {os.path.realpath(os.path.join(self.build, each)) for each in known}
        source = next((each for each in known if each in self.commands), None)
        if source is None or not known & self.headers:
            return name
        output = self.object_of(source)
        if output not in self.made:
            self.made.add(output)
            if self.compile(source, source, output):
                self.made.discard(output)  # it wants one of the header's values at compile time
                return name
        return output

    def link(self, program, objects, selector, output):
        """The test program as ninja links it, with those of these objects (by source) that it holds before its own."""
        commands = subprocess.run(["ninja", "-C", self.build, "-t", "commands", program], check=True,
                                  capture_output=True, text=True).stdout.splitlines()
        made = re.compile(r" -o \S*\b" + re.escape(program) + r"(?:\s|$)")
        line = next(line for line in reversed(commands) if made.search(line))
        words = shlex.split(line)
        words = words[words.index("&&") + 1:] if words[0] == ":" else words
        words = words[:words.index("&&")] if "&&" in words else words
        words[words.index("-o") + 1] = output
        words = [self.with_mutated_headers(word) if word.endswith(".o") else word for word in words]
        first = next(at for at, word in enumerate(words) if word.endswith(".o"))
        held = self.members([word for word in words if word.endswith(".a")])
        words[first:first] = [each for source, each in objects.items() if os.path.basename(source) + ".o" in held]
        words.insert(first, selector)
        os.makedirs(os.path.dirname(output), exist_ok=True)
        self.must(words)

    def members(self, archives):
        within = [each for each in archives if not os.path.isabs(each)]
        told = [subprocess.run(["ar", "t", each], cwd=self.build, check=True, capture_output=True, text=True).stdout
                for each in within]
        return set("".join(told).split())

    def must(self, words):
        done = subprocess.run(words, cwd=self.build, capture_output=True, text=True, check=False)
        if done.returncode != 0:
            raise RuntimeError(f"{' '.join(words)[:400]}\n{(done.stdout + done.stderr)[:4000]}")

    def targets(self, names):
        self.must(["cmake", "--build", self.build, "--parallel", str(self.jobs), "--target", *names])
