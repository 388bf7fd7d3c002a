#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Whether a quick run of the benchmark prints the whole table: every row, with its figure and what stands beside it;
whether its file says the same, and a later run is told beside it.

usage: check_quick_run.py PROGRAM
No time is looked at: a loaded machine is no defect.
"""

import itertools
import json
import os
import re
import subprocess
import sys
import tempfile

# A row's figure, and the peers that it stands beside ("" for none).
ROWS = [
    ("round trip, one processor, median", ("bare", "sd-bus")),
    ("round trip, one processor, p99", ("bare", "sd-bus")),
    ("round trip, placed freely, median", ("bare", "sd-bus")),
    ("round trip, placed freely, p99", ("bare",)),
    ("64 outstanding, a write each", ("bare", "sd-bus")),
    ("processor time a message, nothing wanted", ("bare", "sd-bus")),
    ("64 outstanding, writes gathered", ("bare",)),
    ("64 outstanding, writes gathered, processor time a message", ("bare",)),
    ("16384 outstanding, writes gathered", ("bare",)),
    ("16384 outstanding, writes gathered, processor time a message", ("bare",)),
    ("both events recorded, until committed", ("SQLite alone",)),
    ("both events recorded, old ones expiring (32 MB)", ("SQLite alone",)),
    ("processor time a message, both events recorded", ("",)),
    ("processor time a message, old ones expiring", ("",)),
    ("file a message, both events recorded", ("SQLite alone",)),
    ("a full store asked for two minutes", ("",)),
    ("a full store asked for a session", ("",)),
    ("a full store asked for a rare name", ("",)),
    ("report over 1000 sessions and 10^6 events", ("processor time",)),
    ("page of that report", ("",)),
    ("list of the sessions of a full store", ("processor time",)),
    ("show of a session of a full store", ("processor time",)),
    ("events of the last hour of a full store", ("processor time",)),
    ("64 clients with 4 sessions, both events recorded", ("",)),
    ("processor time a message, 64 clients with 4 sessions", ("",)),
    ("followed at 5000 messages a second, median", ("",)),
    ("followed at 5000 messages a second, p99", ("",)),
    ("settled at 5000 messages a second, p99", ("",)),
    ("messages through a ring, nothing wanted", ("",)),
    ("processor time a message through a ring, nothing wanted", ("",)),
    ("decoding a message, to views", ("bare walk",)),
    ("decoding a request, to a finished dictionary", ("bare walk", "nlohmann")),
    ("encoding a message", ("",)),
    ("resident bytes a logged message", ("map of variants", "its CBOR")),
    ("equality of two messages, equal but for the time", ("map of variants",)),
    ("equality of two messages, unequal", ("map of variants",)),
    ("intake with 10^3 messages logged", ("",)),
    ("intake with 10^4 messages logged", ("with 10^3",)),
    ("trace points off, intake with six more", ("without",)),
    ("trace points off, one alone", ("an empty loop",)),
    ("trace points on, one alone", ("off",)),
    ("diagnostic workers, added to a message that none wants", ("intake without",)),
    ("diagnostic workers, added, last messages held", ("intake without",)),
    ("Wattlog worker alone, added", ("intake without",)),
    ("memory log worker alone, added", ("intake without",)),
    ("Pylon worker alone, added", ("intake without",)),
    ("Snare worker alone, added", ("intake without",)),
    ("Snare worker alone, added, last messages held", ("intake without",)),
    ("DP worker alone, added", ("intake without",)),
    ("Tattle worker alone, added", ("intake without",)),
    ("mirror, hand-over of a message", ("",)),
    ("mirror, stop of a long session", ("without a mirror",)),
    ("mirror, stop until its summary event is sent", ("",)),
    ("threads of the service, 1000 live sessions", ("",)),
    ("resident bytes a live session", ("",)),
    ("evaluation of a trace, processor time", ("by the clock",)),
]
for part in ("median", "p99.9", "worst"):
    for state in ("alive", "stopped", "absent", "killed over and over", "without room on its disk"):
        ROWS.append((f"post of a message, service {state}, {part}", ("bare copy",)))
    ROWS.append((f"the clock around each of them, {part}", ("",)))
for kind in ("ordinary", "merging pairs", "ending segments", "ordinary, summary file"):
    ROWS.append((f"stop of 10^3 messages, {kind}, a message", ("in all",)))
    ROWS.append((f"stop of 10^4 messages, {kind}, a message", ("in all",)))
    ROWS.append((f"stop of 10^4 messages, {kind}, extra memory", ("the log",)))
ROWS.append(("wake-ups a second with 50 quiet rings, service", ("without rings",)))
ROWS.append(("wake-ups a second with 50 quiet rings, library", ("",)))
FIGURE = re.compile(r"^-?\d+(\.\d+)? (ms|us|ns|MB|B|k/s|/s|threads)$")
PEER = re.compile(r"^(?P<name>.+?) \d+(\.\d+)? (ms|us|ns|MB|B|k/s|/s)( \(.*\))?$")


def rows_of(output):
    lines = [line for line in output.splitlines() if line.startswith("|")]
    return [[cell.strip() for cell in line.strip("|").split("|")] for line in lines[2:]]


def what_is_wrong_with_file(path, cells):
    """Each row of the table is in the file, with the number that its text was made of."""
    with open(path, encoding="utf-8") as file:
        figures = json.load(file)["figures"]
    told = [(row["figure"].strip(), row["text"], row.get("peer", ""), row.get("ratio_text", "")) for row in figures]
    printed = [(row[0], row[1], peer_of(row[2]), row[3]) for row in cells]
    for told_row, printed_row in itertools.zip_longest(told, printed):
        if told_row != printed_row:
            return f"the file says {told_row} and the table {printed_row}"
    scales = {"ms": 1e-3, "us": 1e-6, "ns": 1e-9, "MB": 1e6, "k/s": 1e3}
    for row in figures:
        number, unit = row["text"].split()
        value = float(number) * scales.get(unit, 1)
        if abs(value - row["value"]) > max(0.01 * abs(value), 0.6 * scales.get(unit, 1)):
            return f"{row['text']} was made of {row['value']} {row['unit']}"
    return None


def what_is_wrong_with_comparison(program, path):
    """A later run beside the file; files that are none are refused before anything is measured."""
    command = [program, "--quick", "--only", "equality", "--compare"]
    run = subprocess.run([*command, path], capture_output=True, text=True, timeout=60)
    table = run.stdout.partition("beside the run of ")[2]
    rows = [line for line in table.splitlines() if line.startswith("| equality") and "%" in line]
    if run.returncode != 0 or len(rows) != 2:
        return f"the comparison is {run.stdout!r} {run.stderr!r}"
    for bad in (program, path + ".none"):
        run = subprocess.run([*command, bad], capture_output=True, text=True, timeout=60)
        if run.returncode != 1 or bad not in run.stderr or "measuring" in run.stderr:
            return f"compared with {bad}: {run.returncode}, {run.stderr!r}"
    return None


def peer_of(cell):
    return PEER.match(cell)["name"] if cell else ""


def main(program):
    with tempfile.TemporaryDirectory() as folder:
        path = os.path.join(folder, "run.json")
        run = subprocess.run([program, "--quick", "--json", path], stdout=subprocess.PIPE, text=True, timeout=100)
        if run.returncode != 0:
            return f"the benchmark ended with {run.returncode}"
        return (what_is_wrong_with_table(run) or what_is_wrong_with_file(path, rows_of(run.stdout))
                or what_is_wrong_with_comparison(program, path))


def what_is_wrong_with_table(run):
    seen = set()
    for cells in rows_of(run.stdout):
        if len(cells) != 6 or not FIGURE.match(cells[1]):
            return f"a row without a figure: {cells}"
        if cells[2] and not PEER.match(cells[2]):
            return f"a row with a peer that was not measured: {cells}"
        if bool(cells[4]) != bool(cells[5]):
            return f"a row with a target that is not judged, or the other way round: {cells}"
        seen.add((cells[0], peer_of(cells[2])))
    missing = [(figure, peer) for figure, peers in ROWS for peer in peers if (figure, peer) not in seen]
    return f"rows are missing: {missing}\n{run.stdout}" if missing else None


if __name__ == "__main__":
    if len(sys.argv) != 2:
        sys.exit("usage: check_quick_run.py PROGRAM")
    sys.exit(main(sys.argv[1]))
