#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Changes the code in small ways, one at a time, and asks whether its tests notice.

All mutants of a folder are built into its sources at once, each behind a question that TARN_MUTANT answers at run time;
those that must be known to the compiler are built one by one. Exit 1 when a mutant survives that isn't accepted in
tests/mutants-accepted.toml, or when fewer than 97 of 100 are caught.
"""

import argparse
import os
import random
import sys
from concurrent.futures import ThreadPoolExecutor

# Debian keeps the bindings with its own Python.
sys.path.append("/usr/lib/python3/dist-packages")

import campaign  # noqa: E402
import folders  # noqa: E402
import schemata  # noqa: E402
from accepted import Accepted, as_entry  # noqa: E402
from build import Builder  # noqa: E402
from points import Finder  # noqa: E402

LEAST_CAUGHT = 0.97
ROOT = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))


def say(text):
    print(f"mutate: {text}", file=sys.stderr, flush=True)


def texts_of(folder, root):
    files = {}
    for place, _, names in os.walk(os.path.join(root, folder)):
        for name in sorted(names):
            if name.endswith((".cpp", ".h")) and name not in folders.LEFT_OUT:
                path = os.path.realpath(os.path.join(place, name))
                with open(path, encoding="utf-8", newline="") as file:
                    files[path] = file.read()
    return files


def all_mutants(files, builder):
    sources = sorted(path for path in files if path in builder.commands)
    finder = Finder(files)
    for source in sources:
        finder.parse(source, builder.arguments(source))
    mutants = sorted(finder.found.values(), key=lambda each: (each.file, each.start, each.end, each.after))
    seen = {}
    for number, mutant in enumerate(mutants, 1):
        text = files[mutant.file]
        mutant.id = number
        mutant.line = text.count("\n", 0, mutant.start) + 1
        mutant.text = text.split("\n")[mutant.line - 1].strip()
        key = (os.path.basename(mutant.file), mutant.text, mutant.change())
        seen[key] = mutant.occurrence = seen.get(key, 0) + 1
    return sources, mutants


def chosen(mutants, options, dice):
    if options.only:
        mutants = [each for each in mutants if options.only in (str(each.id), os.path.basename(each.file))]
    if options.sample and options.sample < len(mutants):
        mutants = sorted(dice.sample(mutants, options.sample), key=lambda each: each.id)
    return mutants


class Folder:
    """One folder's run."""

    def __init__(self, name, programs, options):
        self.name, self.options = name, options
        self.builder = Builder(options.root, options.build, name, options.jobs)
        self.files = texts_of(name, options.root)
        self.sources, self.mutants = all_mutants(self.files, self.builder)
        dice = random.Random(options.seed)
        self.chosen = chosen(self.mutants, options, dice)
        self.running = [each for each in self.chosen if not each.built]
        built = [each for each in self.chosen if each.built and each.file in self.sources]
        self.built = sorted(dice.sample(built, min(options.built, len(built))), key=lambda each: each.id)
        self.programs = programs

    def run(self):
        """(mutant, fate) of each that could be built; the others are counted."""
        place = self.builder.place
        say(f"{self.name}: {len(self.running)} mutants at run time, {len(self.built)} built one by one")
        self.builder.targets(self.programs)
        dropped = self.builder.mutated(self.files, self.sources, self.running, say)
        selector = self.builder.selector()
        objects = {each: self.builder.object_of(each) for each in self.sources}
        programs = []
        for name in self.programs:
            path = os.path.join(place, "bin", name)
            self.builder.link(name, objects, selector, path)
            programs.append(campaign.Program(path, folders.filter_of(name)))
            campaign.prepare(programs[-1], self.options.seed, place)
            say(f"{self.name}: {name} passes unchanged in {sum(programs[-1].milliseconds.values()) / 1000:.1f} s")
        self.dropped = len(dropped)
        gone = {each.id for each in dropped}
        alive = [each for each in self.running if each.id not in gone]
        race = campaign.Campaign(programs, self.options.seed, lambda text: say(f"{self.name}: {text}"))
        with ThreadPoolExecutor(self.options.jobs) as pool:
            fates = list(zip(alive, pool.map(lambda each: race.fate(each, len(alive)), alive)))
        for mutant in self.built:
            fate = self.build_and_run(mutant, objects, selector, programs)
            if fate is None:
                self.dropped += 1
            else:
                fates.append((mutant, fate))
        return fates

    def build_and_run(self, mutant, objects, selector, programs):
        copy = os.path.join(self.builder.place, "built", os.path.basename(mutant.file))
        self.builder.write(copy, schemata.with_built(self.files[mutant.file], mutant))
        output = os.path.join(self.builder.place, "built", "one.o")
        wrong = self.builder.compile(mutant.file, copy, output)
        if "static assertion failed" in wrong:
            return "caught"
        if wrong:
            return None
        for name, program in zip(self.programs, programs):
            path = os.path.join(self.builder.place, "built", name)
            self.builder.link(name, {**objects, mutant.file: output}, selector, path)
            seconds = 10 + 6 * sum(program.milliseconds.values()) / 1000
            if not campaign.run(path, program.filter, 0, seconds, self.options.seed)[0]:
                return "caught"
        return "survived"


def report(folder, fates, accepted, options):
    """Prints the table of survivors; whether all is well."""
    left = [(mutant, fate) for mutant, fate in fates if fate != "caught"]
    new = [(mutant, fate) for mutant, fate in left if not accepted.holds(mutant)]
    for mutant, fate in left:
        mark = "new     " if (mutant, fate) in new else "accepted"
        where = f"{os.path.relpath(mutant.file, options.root)}:{mutant.line}"
        print(f"{mark} {fate:11} #{mutant.id} {where}: {mutant.change()}")
    if options.entries:
        print("\n".join(as_entry(mutant) for mutant, _ in new))
    share = 1 - len(left) / len(fates) if fates else 1
    stale = [] if options.only or options.sample else accepted.stale(folder.mutants)
    for key in stale:
        print(f"stale    accepted, but no such mutant any more: {key}")
    print(f"{folder.name}: {len(fates)} mutants, {len(fates) - len(left)} caught ({100 * share:.1f}%), "
          f"{len(left) - len(new)} accepted, {len(new)} survive; {folder.dropped} more don't compile", flush=True)
    return not new and not stale and share >= LEAST_CAUGHT


def parse(arguments):
    parser = argparse.ArgumentParser(prog="./dev mutate", description=__doc__.split("\n\n")[0])
    parser.add_argument("folder", nargs="*", help=f"of {', '.join(folders.FOLDERS)}; all when none is named")
    parser.add_argument("--list", action="store_true", help="print the mutants and run none")
    parser.add_argument("--only", metavar="ID|FILE", help="this mutant, or those of the file of this name")
    parser.add_argument("--sample", type=int, metavar="N", help="N mutants of each folder, drawn at random")
    parser.add_argument("--built", type=int, default=40, metavar="N", help="at most N that need a build each (40)")
    parser.add_argument("--seed", type=int, default=1, help="of the sample and of the random tests (1)")
    parser.add_argument("--entries", action="store_true", help="print new survivors as entries of the accepted file")
    parser.add_argument("--jobs", type=int, default=int(os.environ.get("TARN_JOBS") or os.cpu_count() or 2))
    parser.add_argument("--root", default=ROOT, help=argparse.SUPPRESS)
    parser.add_argument("--build", help=argparse.SUPPRESS)
    options = parser.parse_args(arguments)
    options.root = os.path.realpath(options.root)
    options.build = os.path.realpath(options.build or os.path.join(options.root, "build"))
    unknown = [name for name in options.folder if name not in folders.FOLDERS]
    if unknown:
        parser.error(f"no such folder: {' '.join(unknown)} (there are: {', '.join(folders.FOLDERS)})")
    return options


def main(arguments):
    options = parse(arguments)
    accepted = Accepted(os.path.join(options.root, "tests", "mutants-accepted.toml"))
    good = True
    for name in options.folder or folders.FOLDERS:
        folder = Folder(name, folders.FOLDERS[name], options)
        if options.list:
            for each in folder.chosen:
                how = " (built)" if each.built else ""
                print(f"#{each.id} {os.path.relpath(each.file, options.root)}:{each.line}{how}: {each.change()}")
            print(f"{name}: {len(folder.chosen)} mutants")
            continue
        good = report(folder, folder.run(), accepted, options) and good
    return 0 if good else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
