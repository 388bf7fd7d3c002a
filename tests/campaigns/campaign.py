#!/usr/bin/env python3
"""Fault, attack and load campaigns against the real service. Each prints one line with its figures and its seed.

usage: campaign.py --programs DIR --shims DIR [--list] [--seed N] [--brief] [--keep] [NAME|all [SECONDS]]

SECONDS is how long one campaign goes on (20); some end when nothing is left to try. The seed is that of TARN_TEST_SEED,
else of --seed, else a fresh one. Exit 1 when one found something, with what it was and how to repeat it on stderr.
--brief is for runs among other tests. --keep leaves the campaign's folder where it is and says where.
"""

import argparse
import importlib
import os
import shutil
import sys
import tempfile
import traceback

from context import Context, raise_descriptor_limit

SEED_VARIABLE = "TARN_TEST_SEED"
MOST_TOLD = 12

# Name, module, and what it does to the service.
CAMPAIGNS = {
    "kills": ("kills", "SIGKILL at random moments under load: committed, settled and older messages are there, once"),
    "syscalls": ("syscalls", "each system call of store, start and socket fails once or is short: the account closes"),
    "allocations": ("allocations", "each allocation of scenarios, a start, an end fails: the service lives, serves"),
    "bits": ("bits", "flipped bits, cut, zeroed and swapped pages of every file: seen or harmless"),
    "powercut": ("powercut", "writes that weren't synchronised are dropped: what was committed is there, once"),
    "clock": ("clocksteps", "the wall clock steps by days and years, across restarts: no row is removed"),
    "peers": ("peers", "hostile peers beside a polite client: its waits and losses, and the service's memory"),
    "fulldisk": ("fulldisk", "the disk is full and has room again: nothing is lost or doubled"),
    "restarts": ("restarts", "SIGTERM at random moments under load: all that was answered is there, once"),
}


def seed_of(asked):
    text = os.environ.get(SEED_VARIABLE, asked)
    if text is None:
        return int.from_bytes(os.urandom(4), "big")
    try:
        return int(text)
    except ValueError:
        raise SystemExit(f"campaign: {text!r} is no seed") from None


def figures_line(name, context, figures):
    parts = [f"{key}={value:.1f}" if isinstance(value, float) else f"{key}={value}" for key, value in figures.items()]
    verdict = f"failed({len(context.failures)})" if context.failures else "held"
    return f"campaign {name} seed={context.seed} {' '.join(parts)}: {verdict}"


def tell(name, context, seconds):
    for text in context.failures[:MOST_TOLD]:
        print(f"  {name}: {text}", file=sys.stderr)
    if len(context.failures) > MOST_TOLD:
        print(f"  {name}: and {len(context.failures) - MOST_TOLD} more", file=sys.stderr)
    print(f"  replay: {SEED_VARIABLE}={context.seed} ./dev campaign {name} {seconds:g}", file=sys.stderr, flush=True)


def run(name, options, seconds):
    """Whether it held."""
    folder = tempfile.mkdtemp(prefix="tarncampaign")
    context = Context(os.path.join(options.programs, "tarnreportingd"), options.shims, folder, seconds,
                      seed_of(options.seed), options.brief)
    figures = {}
    try:
        importlib.import_module(CAMPAIGNS[name][0]).run(context, figures)
    except Exception:  # what went wrong belongs into the account, with the seed; the other campaigns go on
        context.fail(f"the campaign itself ended early:\n{traceback.format_exc()}")
    finally:
        context.end()
        if options.keep:
            print(f"  {name}: kept {folder}", file=sys.stderr)
        else:
            shutil.rmtree(folder, ignore_errors=True)
    print(figures_line(name, context, figures), flush=True)
    if context.failures:
        tell(name, context, seconds)
    return not context.failures


def options_of(words):
    parser = argparse.ArgumentParser(prog="campaign", add_help=False)
    parser.add_argument("--programs", default="build/bin")
    parser.add_argument("--shims", default="build/tests/shims")
    parser.add_argument("--seed")
    parser.add_argument("--list", action="store_true")
    parser.add_argument("--brief", action="store_true")
    parser.add_argument("--keep", action="store_true")
    parser.add_argument("--help", "-h", action="store_true")
    parser.add_argument("name", nargs="?", default="all")
    parser.add_argument("seconds", nargs="?", type=float, default=20.0)
    return parser.parse_args(words)


def main(words):
    options = options_of(words)
    if options.help:
        print(__doc__)
        return 0
    if options.list:
        for name, (_, what) in CAMPAIGNS.items():
            print(f"{name:12} {what}")
        return 0
    if options.name != "all" and options.name not in CAMPAIGNS:
        print(f"campaign: there is no {options.name!r} (there are: {' '.join(CAMPAIGNS)})", file=sys.stderr)
        return 64
    if options.seconds <= 0:
        print("campaign: a campaign takes more than no time", file=sys.stderr)
        return 64
    raise_descriptor_limit()
    names = CAMPAIGNS if options.name == "all" else [options.name]
    held = [run(name, options, options.seconds) for name in names]
    return 0 if all(held) else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
