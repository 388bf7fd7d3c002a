#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Fault, attack and load campaigns against the real service. Each prints one line with its figures and its seed.

usage: campaign.py --programs DIR --shims DIR [--list] [--seed N [--fresh]] [--brief] [--keep]
                   [NAME[/PART]|all [SECONDS]]

PART is one of the parts of a campaign that has some, which then print a line each. SECONDS is how long one campaign
goes on (20); some end when nothing is left to try. The seed is that of TARN_TEST_SEED, else of --seed, else a fresh
one. With --fresh a campaign goes on for half as long with a fresh seed. Exit 1 when one found something, with what it
was and how to repeat it on stderr. --brief is for runs among other tests. --keep leaves the campaign's folder where it
is and says where.
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
    "stalls": ("stalls", "synchronisations that take half a second, then SIGKILL: only what came in meanwhile is lost"),
    "syscalls": ("syscalls", "each system call of store, start and socket fails once or is short: the account closes"),
    "allocations": ("allocations", "each allocation of scenarios, a start, an end fails: the service lives, serves"),
    "bits": ("bits", "flipped bits, cut, zeroed and swapped pages of every file: seen or harmless"),
    "migration": ("migration", "SIGKILL while an older store is brought to the present layout: nothing is lost"),
    "powercut": ("powercut", "writes that weren't synchronised are dropped: what was committed is there, once"),
    "clock": ("clocksteps", "the wall clock steps by days and years, across restarts: no row is removed"),
    "peers": ("peers", "hostile peers beside a polite client: its waits and losses, and the service's memory"),
    "fulldisk": ("fulldisk", "the disk is full and has room again: nothing is lost or doubled"),
    "ringkills": ("ringkills", "SIGKILL to programs that post to rings: what a ring calls posted is there, once"),
    "ringrestarts": ("ringrestarts", "the service ends and starts while programs post to rings: no call fails"),
    "streams": ("streams", "200 streams a minute of a real PipeWire: a session each, as long as it ran, none open"),
    "export": ("exports", "exporters, a proxy that refuses, loses and reorders, kills: the stream has all, once"),
    "fleet": ("fleets", "200 exporters, proxies, three servers, collectors, kills: the database has all, once"),
    "ends": ("ends", "SIGTERM at random moments under load: all that was answered is there, once"),
    "restarts": ("restarts", "restarts with the socket kept, under 5,000 messages a second of the libraries' programs"),
    "reloads": ("reloads", "the configuration is read anew under load, a tenth broken: no client notices"),
}


def runs_of(asked, fresh, seconds):
    """Seeds, and how long each is played: a seed that is to be repeated is played alone."""
    text = os.environ.get(SEED_VARIABLE, asked)
    if text is None:
        return [(fresh_seed(), seconds)]
    try:
        runs = [(int(text), seconds)]
    except ValueError:
        raise SystemExit(f"campaign: {text!r} is no seed") from None
    if fresh and SEED_VARIABLE not in os.environ:
        runs.append((fresh_seed(), seconds / 2))
    return runs


def fresh_seed():
    return int.from_bytes(os.urandom(4), "big")


def figures_line(name, context, figures):
    parts = [f"{key}={value:.1f}" if isinstance(value, float) else f"{key}={value}" for key, value in figures.items()]
    failures = context.failures_of_part()
    verdict = f"failed({failures})" if failures else "held"
    return f"campaign {name} seed={context.seed} {' '.join(parts)}: {verdict}"


def tell(name, context, seconds):
    for text in context.failures[:MOST_TOLD]:
        print(f"  {name}: {text}", file=sys.stderr)
    if len(context.failures) > MOST_TOLD:
        print(f"  {name}: and {len(context.failures) - MOST_TOLD} more", file=sys.stderr)
    print(f"  replay: {SEED_VARIABLE}={context.seed} ./dev campaign {name} {seconds:g}", file=sys.stderr, flush=True)


def run(name, part, options, seed, seconds):
    """Whether it held."""
    folder = tempfile.mkdtemp(prefix="tarncampaign")
    context = Context(os.path.join(options.programs, "tarnreportingd"), options.shims, folder, seconds,
                      seed, options.brief)
    context.only = part

    def tell_part(part, figures):
        print(figures_line(f"{name}/{part}", context, figures), flush=True)

    context.tell_part = tell_part
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
    context.begin_part(whole=True)
    if not part:
        print(figures_line(name, context, figures), flush=True)
    if context.failures:
        tell(f"{name}/{part}" if part else name, context, seconds)
    return not context.failures


def options_of(words):
    parser = argparse.ArgumentParser(prog="campaign", add_help=False)
    parser.add_argument("--programs", default="build/bin")
    parser.add_argument("--shims", default="build/tests/shims")
    parser.add_argument("--seed")
    parser.add_argument("--fresh", action="store_true")
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
    name, _, part = options.name.partition("/")
    if name != "all" and name not in CAMPAIGNS:
        print(f"campaign: there is no {options.name!r} (there are: {' '.join(CAMPAIGNS)})", file=sys.stderr)
        return 64
    if options.seconds <= 0:
        print("campaign: a campaign takes more than no time", file=sys.stderr)
        return 64
    raise_descriptor_limit()
    names = CAMPAIGNS if name == "all" else [name]
    held = [run(name, part, options, *each) for name in names
            for each in runs_of(options.seed, options.fresh, options.seconds)]
    return 0 if all(held) else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
