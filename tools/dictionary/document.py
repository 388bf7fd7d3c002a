# SPDX-License-Identifier: Apache-2.0
"""docs/messages.md: the data dictionary."""

import json
import re
import textwrap

from table import PATH

COLUMNS = 120
HEAD = f"""# What can be said

The data dictionary: categories, types and service types, every key that the service reads or writes, and every message
that it makes of others, each with an example. This page is made from `{PATH}`
(`python3 tools/dictionary/generate.py`), as are the constants for C, C++ and Python. A check holds the table against
the code, and a test plays the examples against the service.

<!-- not run: a synopsis -->

    tarnreportingctl explain KvSessionVolume          what this page says of a name or a key
    tarnreportingctl lint player.jsonl                what in a script is unknown, of a wrong kind or unit, or unread

| language | include |
|---|---|
| C, C++ | `tarnreporting_messages.h`: `TARN_CATEGORY_PLAYBACK`, `TARN_KEY_SESSION_OUTPUT_RUNNING` |
| C++17 | `tarnreporting_messages.hpp`: `tarnreporting::Category::Playback`, `keys::kSessionOutputRunning` |
| Python | `tarnreporting.messages`: `Category.PLAYBACK`, `Key.SESSION_OUTPUT_RUNNING` |

Whatever else a message holds is carried as it is: it is in the analytics event, in the summary file and in the mirrored
session, and nothing is derived from it."""
KEYS = """## Keys

What a reader gets of another kind is converted: a text counts by its leading number, a boolean is 1 or 0. Nothing is
refused for it, so a wrong kind is found by `tarnreportingctl lint` or not at all. Blanks in keys become `_`. A `*` in a
name stands for any text. Parts are called without `TarnReporting` here."""
REPORTS = """## Reports

Messages for which the clients have a function each, so that an engine needs no key: C
`tarnreporting_report_output_running(writer, &reports, 0.5, "Speaker")` (`tarnreporting_reports.h`), C++
`reports.outputRunning(writer, 0.5, "Speaker")` (`tarnreporting_reports.hpp`), Python
`session.output_running(0.5, "Speaker")`."""
DERIVED = """## Messages that the service makes

To these the intake adds what it adds to every message: a stamp (and `invalid_timestamp`, since they come without),
`audiotag` and the application. In what is recorded, `<now>` is a moment of the playing in epoch seconds, `<number>` a
number, `<text>` a text and `<any>` anything. Long lines are broken here; whole ones, to be played:

    tarnreportingctl explain --script Volume.Summary | tarnreportingctl run"""
EVENTS = """## What back-ends get instead of a message"""


def document(table):
    blocks = [HEAD, names(table), KEYS]
    sections = {}
    for key in table.keys:
        sections.setdefault(key.section, []).append(key)
    for section, keys in sections.items():
        blocks.append(f"### {section}\n\n" + key_table(keys))
    blocks.append(REPORTS + "\n\n" + rows("report", "arguments", [report_row(report) for report in table.reports],
                                          "category, type", "keys", "meaning"))
    blocks.append(DERIVED)
    blocks.extend(derived(entry) for entry in table.derived if not entry.event)
    blocks.append(EVENTS)
    blocks.extend(derived(entry) for entry in table.derived if entry.event)
    blocks.append("## Who reads and writes\n\n" + rows("part", "what it does", [
        (f"`{short(part.name)}`", part.text) for part in table.parts]))
    return "\n\n".join(blocks) + "\n"


def names(table):
    blocks = ["## Categories, types, service types\n\nMessages give them by number, scripts by number or by name."]
    for title, what, entries in (("Categories", "category", table.categories), ("Types", "type", table.types),
                                 ("Service types", "service type", table.services)):
        blocks.append(f"### {title}\n\n" + rows("number", what, [
            (number(row.number), f"`{row.name}`" + ("" if row.by_name else " (by number alone)"), row.text)
            for row in entries], "meaning"))
    blocks.append("The high half of a category may be one domain, which leads the printed name: `DSP_Playback` is"
                  " 0x10000004.\n\n" + rows("domain", "name", [
                      (f"0x{row.number:08X}", f"`{row.name}`", row.text) for row in table.domains], "meaning"))
    return "\n\n".join(blocks)


def number(value):
    return str(value) if value < 0x10000 else f"{value} (0x{value:08X})"


def report_row(report):
    keys = [f"`{each.key}`" + (f" ({each.argument})" if each.argument else f" = {json.dumps(each.constant)}")
            for each in report.fields]
    return (report.name, ", ".join(each.argument for each in report.arguments()) or "none",
            f"{report.category} {report.type}", ", ".join(keys), report.text)


def key_table(keys):
    derives = any(key.derives for key in keys)
    return rows("key", "kind, unit, range", [
        (f"`{cell(key.name)}`", key.measure(), meaning(key), *([cell(key.derives)] if derives else []),
         parts(key.readers), parts(key.writers)) for key in keys],
        "meaning", *(["what it derives"] if derives else []), "read by", "written by")


def meaning(key):
    said = [key.text]
    if key.values:
        said.append("Texts that mean something: " + ", ".join(f"`{value}`" for value in key.values) + ".")
    if key.places != ["message"]:
        said.append("In: " + ", ".join(key.places) + ".")
    if key.only_in:
        said.append("Read in " + ", ".join(f"`{place}`" for place in key.only_in) + " alone.")
    return cell(" ".join(said))


def parts(names_of):
    return ", ".join(f"`{short(name)}`" for name in names_of)


def short(name):
    return name.removeprefix("TarnReporting")


def cell(text):
    return text.replace("|", "\\|")


def rows(first, second, entries, *more):
    heads = [first, second, *more]
    lines = ["| " + " | ".join(heads) + " |", "|" + "---|" * len(heads)]
    return "\n".join(lines + ["| " + " | ".join(entry) + " |" for entry in entries])


def derived(entry):
    said = [f"Made by `{short(entry.by)}` {entry.when}. {entry.text}"]
    if entry.keys:
        said.append("Keys: " + ", ".join(f"`{key}`" for key in entry.keys) + ".")
    said.append(entry.example["text"])
    blocks = [f"### {title(entry)}"] + ["\n".join(textwrap.wrap(text, COLUMNS, break_long_words=False,
                                                                break_on_hyphens=False)) for text in said]
    blocks[-1] += before(entry.example)
    blocks.append(code(entry.script()))
    blocks.append("Recorded:")
    blocks.append(code(entry.recorded()))
    return "\n\n".join(blocks)


def title(entry):
    return f"`{entry.event}` (back-end {entry.backend})" if entry.event else f"{entry.category} {entry.type}"


def before(example):
    said = ""
    if "before" in example:
        said += "\n\n" + "\n".join(f"    tarnreportingctl {call}" for call in example["before"])
    if "channels" in example:
        said += " The driver's file, at the start and at the stop:\n\n" + code(example["channels"])
    return said


def code(lines):
    """Lines of JSON, broken where they are long."""
    return "\n".join(part for line in lines for part in broken(json.dumps(json.loads(line))))


def broken(line):
    """The line in parts that fit, each after the first a bit further in: broken between two members."""
    current = "    "
    for piece in re.split(r"(?<=[,{]) ?(?=\")", line):
        space = " " if current.endswith(",") else ""
        if len(current) + len(space) + len(piece) > COLUMNS and not current.isspace():
            yield current
            current, space = "      ", ""
        current += space + piece
    yield current
