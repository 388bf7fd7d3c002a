# SPDX-License-Identifier: Apache-2.0
"""dictionary/messages.toml against the code: each key that the code names is in the table, under a part that has the
file; each part that an entry names is there, and one of its files knows the key; the numbers are those of the
vocabulary; and what is made from the table is current.

What adapters say is clients' talk, and named by the constants that are made from the table, or by a literal: these keys
too are in the table, under a part that has the file.

A key is named by a plist::Key, by what stands in the brackets or the first place of a dictionary's operation, and by a
member of a dictionary, or of the list of watched settings, that is written out; as a literal or by a constant.
"""

import os
import re
import sys

from tree import TOKEN, Finding

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "dictionary"))

from generate import made  # noqa: E402
from table import PATH, Fault, load, pascal  # noqa: E402

ADAPTERS = "adapters/pipewire/core/"
FOLDERS = ("session/", "derived/", "diagnostics/", "telemetry/", "service/", ADAPTERS)
VOCABULARY = "service/vocabulary/TarnReportingVocabulary.h"
CLASSES = "service/TarnReportingWorkerClasses.cpp"
# (file, key): what it is, which is no part of a message.
EXCEPTIONS = {
    **dict.fromkeys([("derived/TarnReportingSystemMonitor.cpp", key) for key in (
        "feature_domain", "defaults_domain", "notification", "notify_token")], "describes a setting"),
    ("derived/TarnReportingSystemMonitor.cpp", "disable_reporting"): "a setting of the service",
    ("service/main.cpp", "disable_reporting"): "likewise",
    ("telemetry/trace/TarnReportingTraceResults.cpp", "APPROVED_BY_SKEIN_TEAM"): "a variable of the environment",
    **dict.fromkeys([("service/TarnReportingClientServerInstance.cpp", key) for key in (
        "reporterID", "serviceType")], "the answer to a request"),
}

KEY_TYPE = r"(?:tarn::)?(?:plist::)?Key"
NAME = r"(?:\w+(?:::|\.))*\w+"
DECLARED = re.compile(KEY_TYPE + r"\s+(\w+)\s*[({]\s*\"([^\"]+)\"\s*[)}]")
MADE = re.compile(KEY_TYPE + r"\s*[({]\s*\"([^\"]+)\"\s*[)}]")
TEXT = re.compile(r"constexpr\s+(?:std::string_view|const\s+char\s*\*)\s+(\w+)\s*=\s*\"([^\"]+)\"")
USED = re.compile(r"(?:(?:\.|->)(?:get|set|contains|remove|hasKeyWithPrefix)\(\s*|\bconfiguredText\([^,;]*,\s*|\[\s*)"
                  r"(?:\"([^\"]+)\"|(" + NAME + r"))\s*[,)\]]")
COMPUTED = re.compile(r"\bgetDriverStatsKey\([^\"();]*,\s*\"(\w+)\"\)")
WRITTEN_OUT = re.compile(r"\b(?:Dictionary|array<Feature, \d+>)(?:\s+\w+)?\s*\{")
MEMBER = re.compile(r"\{\s*(?:\"([^\"]+)\"(\s*\+\s*\w+)?|(" + NAME + r"))\s*,")
# A field of what an adapter says: {keys::kMuted, ...}, addText(fields, "muted", ...).
SAID = re.compile(r"\bkeys::k(\w+)|(?:push_back\(\{|\badd(?:Text|Number)\([\w.]+,)\s*\"([^\"]+)\"")
ENUMERATOR = re.compile(r"(\w+)\s*=\s*(0x[0-9A-Fa-f]+|\d+)")
WORKER = re.compile(r"\bTarnReportingSession\w+Worker\b(?!\.h|Class)")


def check(tree):
    if PATH not in tree.files:
        return [Finding(PATH, 1, "the table of what can be said is missing")]
    try:
        table = load(tree.files[PATH])
    except Fault as fault:
        return [Finding(PATH, line_of(tree, str(fault).partition(" ")[2].partition(":")[0]), str(fault))]
    found = sorted(keys_named(tree) + keys_said(tree, table))
    return sorted(unknown_keys(table, found) + idle_parts(tree, table, found) + wrong_numbers(tree, table)
                  + missing_parts(tree, table) + stale(tree))


def line_of(tree, name):
    """Where the table speaks of it."""
    lines = tree.files[PATH].split("\n")
    return next((number for number, line in enumerate(lines, 1) if f'name = "{name}"' in line), 1)


def unknown_keys(table, found):
    parts = {}
    for part in table.parts:
        for file in part.files:
            parts.setdefault(file, set()).add(part.name)
    findings = []
    for path, line, key in found:
        if not path.startswith(FOLDERS) or (path, key) in EXCEPTIONS:
            continue
        entries = [entry for entry in table.keys if is_about(entry, key)]
        if not entries:
            findings.append(Finding(path, line, f"{key} is no key of {PATH}"))
        elif not any(set(entry.readers + entry.writers) & parts.get(path, set()) for entry in entries):
            findings.append(Finding(path, line, f"no part that {PATH} names for {key} has this file"))
    return findings


def is_about(entry, key):
    """`key` may end or begin with *: a part of it is computed."""
    return entry.name == key or (key.endswith("*") and not entry.is_pattern() and entry.name.startswith(key[:-1]))


def idle_parts(tree, table, found):
    known = {}
    for path, _, key in found:
        known.setdefault(path, set()).add(key)
    findings = []
    for entry in table.keys:
        for name in dict.fromkeys(entry.readers + entry.writers):
            files = next(part.files for part in table.parts if part.name == name)
            if not any(is_about(entry, key) for file in files for key in known.get(file, ())) and not any(
                    f'"{entry.name}"' in tree.files.get(file, "") for file in files):
                findings.append(Finding(PATH, line_of(tree, entry.name), f"no file of {name} knows {entry.name}"))
    return findings


def missing_parts(tree, table):
    findings = [Finding(PATH, line_of(tree, part.name), f"{part.name} has a file that there isn't: {file}")
                for part in table.parts for file in part.files if file not in tree.files]
    names = {part.name for part in table.parts}
    workers = dict.fromkeys(WORKER.findall(without_comments(tree.files.get(CLASSES, ""))))
    return findings + [Finding(PATH, 1, f"there is no part {worker}, which is in the table of worker classes")
                       for worker in workers if worker not in names]


def wrong_numbers(tree, table):
    findings = []
    text = without_comments(tree.files.get(VOCABULARY, ""))
    for enumeration, lists, more in (("AudioEventCategory", (table.categories, table.domains), {"SessionGeneric"}),
                                     ("AudioEventType", (table.types,), set()),
                                     ("AudioServiceType", (table.services,), set())):
        body = re.search(rf"enum class {enumeration}\b[^{{]*\{{(.*?)\}}", text, re.DOTALL)
        code = {name: int(number, 0) for name, number in ENUMERATOR.findall(body.group(1) if body else "")}
        told = {("Domain" if rows is table.domains else "") + row.called(): row.number
                for rows in lists for row in rows}
        for name in sorted(code.keys() | told.keys()):
            if name not in more and code.get(name) != told.get(name):
                findings.append(Finding(PATH, line_of(tree, name.removeprefix("Domain")),
                                        f"{name} is {told.get(name)} here and {code.get(name)} in {enumeration}"))
    return findings


def stale(tree):
    return [Finding(path, 1, f"isn't what {PATH} makes of it: run tools/dictionary/generate.py")
            for path, text in made(tree.files[PATH]).items() if tree.files.get(path) != text]


def keys_named(tree):
    """(file, line, key) for each key that the code names; a key with a computed end or begin has a * there."""
    texts = {path: without_comments(text) for path, text in tree.cxx().items()
             if path.startswith(FOLDERS) or path == "platform/RtcReportingService.h"}
    shared = {}
    for path, text in texts.items():
        if path.endswith(".h"):
            shared.update({name: key for pattern in (DECLARED, TEXT) for name, key in pattern.findall(text)})
    found = set()
    for path, text in texts.items():
        constants = {**shared, **{name: key for pattern in (DECLARED, TEXT) for name, key in pattern.findall(text)}}
        found.update((path, text.count("\n", 0, at) + 1, key) for at, key in keys_in(text, constants, shared, path))
    return sorted(found)


def keys_said(tree, table):
    """(file, line, key) for each key of what adapters say; of a constant that there isn't, its name."""
    names = {pascal(entry.name): entry.name for entry in table.keys if entry.is_constant()}
    found = {(path, text.count("\n", 0, match.start()) + 1, names.get(match.group(1), match.group(1)) or match.group(2))
             for path, text in ((path, without_comments(text)) for path, text in tree.cxx().items()
                                if path.startswith(ADAPTERS))
             for match in SAID.finditer(text)}
    return sorted(found)


def keys_in(text, constants, shared, path):
    """(place, key) for each key that this text names."""

    def resolved(match, literal, name):
        if match.group(literal):
            return match.group(literal)
        scope, last = re.match(r"(.*::)?(?:\w+\.)*(\w+)$", match.group(name)).groups()
        return shared.get(last) if scope else constants.get(last)

    if path.endswith(".cpp"):
        # A key that a header declares is the user's.
        yield from ((match.start(), match.group(2)) for match in DECLARED.finditer(text))
        yield from ((match.start(), match.group(1)) for match in MADE.finditer(text))
        yield from ((match.start(), constants[match.group(1)]) for match in re.finditer(r"\bkeys::(\w+)", text)
                    if match.group(1) in constants)
    for match in USED.finditer(text):
        if key := resolved(match, 1, 2):
            yield match.start(), key + ("*" if "hasKeyWithPrefix" in match.group(0) else "")
    yield from ((match.start(), f"*_{match.group(1)}_*") for match in COMPUTED.finditer(text))
    for start in (match.end() for match in WRITTEN_OUT.finditer(text)):
        for match in MEMBER.finditer(text, start - 1, end_of(text, start)):
            if key := resolved(match, 1, 3):
                yield match.start(), key + ("*" if match.group(2) else "")


def end_of(text, start):
    """Where the brace that was opened before `start` is closed."""
    depth = 1
    for at in range(start, len(text)):
        depth += {"{": 1, "}": -1}.get(text[at], 0)
        if depth == 0:
            return at
    return len(text)


def without_comments(text):
    def blank(match):
        found = match.group(0)
        return found if found[0] not in "/" else re.sub(r"[^\n]", " ", found)

    return TOKEN.sub(blank, text)
