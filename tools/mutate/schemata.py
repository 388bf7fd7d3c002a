# SPDX-License-Identifier: Apache-2.0
"""Writes a source that holds all of its mutants at once: each asks at run time whether it is the chosen one.

Lines stay where they are, so that the compiler's messages name the lines of the original.
"""

import os
import re
import sys

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "lint"))

from tree import TOKEN  # noqa: E402

ASK = "tarn_mutant_is"


def rewritten(text, mutants):
    """`text` with the run-time mutants built in."""
    edits = {}
    for mutant in mutants:
        edits.setdefault((mutant.start, mutant.end), []).append(mutant)
    skips = {mutant.mate: mutant for mutant in mutants if mutant.kind == "swapped"}
    for place in skips:
        edits.setdefault(place, [])
    places = sorted(edits, key=lambda place: (place[0], -place[1]))
    return render(text, 0, len(text), places, edits, skips)


def render(text, start, end, places, edits, skips):
    """The part from `start` to `end`, whose places are in order, the outer before the inner."""
    out = []
    at = start
    index = 0
    while index < len(places):
        place = places[index]
        inner = index + 1
        while inner < len(places) and places[inner][0] < place[1]:
            inner += 1
        within = [each for each in places[index + 1:inner] if each[1] <= place[1]]
        out.append(text[at:place[0]])
        out.append(changed(render(text, *place, within, edits, skips), text, edits[place], skips.get(place)))
        at = place[1]
        index = inner
    out.append(text[at:end])
    return "".join(out)


def changed(original, text, mutants, skip):
    """One place: `original` holds the mutants further inside. No other mutant is on where one of these is."""
    expressions = [each for each in mutants if each.kind == "expression"]
    # Both sides must be of one type, or the compiler converts one to the other.
    cast = "static_cast<bool>" if any(each.truth for each in expressions) else ""
    for mutant in reversed(expressions):
        original = f"({ASK}({mutant.id}) ? {cast}({one_line(mutant.after)}) : {cast}({original}))"
    if not skip and len(expressions) == len(mutants):
        return original
    off = [mutant for mutant in mutants if mutant.kind == "removed"] + ([skip] if skip else [])
    unless = "".join(f"if (!{ASK}({mutant.id})) " for mutant in off)
    before = "".join(f"if ({ASK}({mutant.id})) {{ {one_line(text[slice(*mutant.mate)])} }} "
                     for mutant in mutants if mutant.kind == "swapped")
    return f"{{ {before}{unless}{{ {original} }} }}"


def one_line(code):
    """Without comments and line ends; texts stay as they are."""
    code = TOKEN.sub(lambda match: " " if match.group(0).startswith(("//", "/*")) else match.group(0), code)
    return re.sub(r"\s*\n\s*", " ", code)


def asked_before(line, column):
    """The mutant that the compiler complains about: the last one asked for before that column of a rewritten line."""
    found = None
    for match in re.finditer(ASK + r"\((\d+)\)", line):
        if match.start() > column and found is not None:
            break
        found = int(match.group(1))
    return found


def with_built(text, mutant):
    """The source with this one change and no other."""
    return text[:mutant.start] + mutant.after + text[mutant.end:]
