# SPDX-License-Identifier: Apache-2.0
"""The table of what can be said, dictionary/messages.toml: read, and held against itself."""

import json
import re
import tomllib
from dataclasses import dataclass, field

PATH = "dictionary/messages.toml"
KINDS = ("boolean", "integer", "number", "text", "any")
PLACES = ("message", "configuration", "event")
# What the intake and the summary file add to any message.
ADDED = ("tarnreporting_timestamp", "invalid_timestamp", "audiotag", "HostApplicationDisplayID", "isSessionStarted")
WORD = re.compile(r"[A-Z]+(?=[A-Z][a-z])|[A-Z]?[a-z]+|[A-Z]+|\d+")


def words(name):
    """The words of a name in whatever spelling: mFormatID is m, Format, ID."""
    return WORD.findall(name.replace("MiB", "Mib"))


def upper(name):
    return "_".join(words(name)).upper()


def pascal(name):
    return "".join(word[0].upper() + word[1:] for word in words(name))


class Fault(Exception):
    """What is wrong with the table; the text begins with the entry that it is about."""


@dataclass(frozen=True)
class Named:
    """A category, a domain, a type or a service type."""
    number: int
    name: str
    text: str
    by_name: bool = True
    enumerator: str = ""

    def called(self):
        return self.enumerator or self.name


@dataclass(frozen=True)
class Part:
    name: str
    text: str
    files: list


@dataclass(frozen=True)
class Key:
    name: str
    section: str
    kind: str
    text: str
    unit: str = ""
    range: list = field(default_factory=list)
    values: list = field(default_factory=list)
    places: list = field(default_factory=lambda: ["message"])
    only_in: list = field(default_factory=list)
    readers: list = field(default_factory=list)
    writers: list = field(default_factory=list)
    derives: str = ""

    def is_pattern(self):
        return "*" in self.name

    def stands_for(self, name):
        return re.fullmatch(".+".join(map(re.escape, self.name.split("*"))), name) is not None

    def is_constant(self):
        """Whether a client may want a name for it."""
        return not self.name.startswith("*") and self.places != ["event"]

    def measure(self):
        """Kind, unit and range, for people: number, s, 0 to 1."""
        bounds = [f"{self.range[0]} to {self.range[1]}"] if self.range else []
        return ", ".join([self.kind, *([self.unit] if self.unit else []), *bounds])


@dataclass(frozen=True)
class Derived:
    by: str
    when: str
    text: str
    keys: list
    example: dict
    category: str = ""
    type: str = ""
    event: str = ""
    backend: str = ""

    def title(self):
        return self.event or f"{self.category} {self.type}"

    def script(self):
        return self.example["script"].strip().split("\n")

    def recorded(self):
        return self.example["recorded"].strip().split("\n")


@dataclass(frozen=True)
class Field:
    """A key of a report, and where its value comes from: a constant or an argument."""
    key: str
    constant: object = None
    argument: str = ""
    hertz: bool = False


@dataclass(frozen=True)
class Report:
    name: str
    category: str
    type: str
    text: str
    fields: list

    def arguments(self):
        return [each for each in self.fields if each.argument]


@dataclass(frozen=True)
class Table:
    categories: list
    domains: list
    types: list
    services: list
    parts: list
    keys: list
    derived: list
    reports: list

    def kind_of(self, name):
        return next(key.kind for key in self.keys if key.name == name)


def load(text):
    """The table that this text is; raises Fault."""
    try:
        raw = tomllib.loads(text)
    except tomllib.TOMLDecodeError as error:
        raise Fault(f"the table is no TOML: {error}") from error
    kinds = {"category": Named, "domain": Named, "type": Named, "service": Named, "part": Part, "key": Key,
             "derived": Derived, "report": Report}
    if unknown := set(raw) - set(kinds):
        raise Fault(f"{sorted(unknown)[0]}: there is no such list")
    lists = {name: [made(kind, name, row) for row in raw.get(name, [])] for name, kind in kinds.items()}
    table = Table(*lists.values())
    for fault in faults(table):
        raise Fault(fault)
    return table


def made(kind, what, row):
    try:
        if kind is Report:
            row = {**row, "fields": [Field(**{"constant" if name == "is" else name: value
                                              for name, value in each.items()}) for each in row.get("fields", [])]}
        return kind(**row)
    except TypeError as error:
        name = row.get("name") or row.get("event") or row.get("category", "?")
        raise Fault(f"{what} {name}: {str(error).split('__init__() ')[-1]}") from error


def faults(table):
    yield from faults_of_names(table)
    parts = {part.name for part in table.parts}
    for key in table.keys:
        yield from (f"key {key.name}: {what}" for what in faults_of_key(table, key, parts))
    for entry in table.derived:
        yield from (f"derived {entry.title()}: {what}" for what in faults_of_derived(table, entry, parts))
    yield from faults_of_derived_keys(table)
    yield from (f"report {each}: stands twice" for each in repeated(report.name for report in table.reports))
    for report in table.reports:
        yield from (f"report {report.name}: {what}" for what in faults_of_report(table, report))


def faults_of_names(table):
    for what, rows in (("category", table.categories), ("domain", table.domains), ("type", table.types),
                       ("service", table.services)):
        for attribute in ("number", "name"):
            yield from (f"{what} {each}: stands twice" for each in repeated(getattr(row, attribute) for row in rows))
    yield from (f"part {each}: stands twice" for each in repeated(part.name for part in table.parts))
    yield from (f"key {each}: stands twice" for each in repeated(key.name for key in table.keys))
    constants = [upper(key.name) for key in table.keys if key.is_constant()]
    yield from (f"key {each}: two keys have this constant" for each in repeated(constants))


def repeated(items):
    seen = set()
    for item in items:
        if item in seen:
            yield item
        seen.add(item)


def faults_of_key(table, key, parts):
    if key.kind not in KINDS:
        yield f"no kind is {key.kind!r}"
    if not key.text.endswith("."):
        yield "its text is no sentence"
    if unknown := [place for place in key.places if place not in PLACES]:
        yield f"there is no place {unknown[0]!r}"
    if key.range and (len(key.range) != 2 or key.range[0] >= key.range[1] or key.kind not in ("integer", "number")):
        yield "a range is the least and the greatest of a number"
    if key.values and key.kind != "text":
        yield "only texts have values"
    if not key.readers and not key.writers:
        yield "nobody reads or writes it"
    yield from (f"there is no part {name}" for name in key.readers + key.writers if name not in parts)
    for place in key.only_in:
        category, _, kind = place.partition(".")
        if category not in ["*"] + [row.name for row in table.categories]:
            yield f"there is no category {category}"
        if kind not in ["*"] + [row.name for row in table.types]:
            yield f"there is no type {kind}"


def faults_of_derived(table, entry, parts):
    keys = {key.name: key for key in table.keys}
    if entry.by not in parts:
        yield f"there is no part {entry.by}"
    if not entry.event:
        domain, _, category = entry.category.rpartition("_")
        if category not in [row.name for row in table.categories]:
            yield f"there is no category {category}"
        if domain and domain not in [row.name for row in table.domains]:
            yield f"there is no domain {domain}"
        if entry.type not in [row.name for row in table.types]:
            yield f"there is no type {entry.type}"
    for name in entry.keys:
        if name not in keys:
            yield f"there is no key {name}"
        elif entry.by not in keys[name].writers:
            yield f"{entry.by} doesn't write {name}"
    yield from faults_of_example(table, entry)


def faults_of_example(table, entry):
    for what, lines in (("script", entry.script()), ("recorded", entry.recorded())):
        for line in lines:
            try:
                json.loads(line)
            except ValueError:
                yield f"its {what} has a line that is no JSON: {line}"
                return
    if entry.backend == "pylon":
        return  # a record with fields of its own
    known = [key for key in table.keys if key.name in entry.keys + list(ADDED)]
    if entry.category == "Unknown":
        known = table.keys  # the values of every key that the session had
    for event in map(json.loads, entry.recorded()):
        for name in event["payload"]:
            if not any(key.stands_for(name) for key in known):
                yield f"its example shows {name}, which isn't among its keys"


def faults_of_derived_keys(table):
    """What a part that derives writes must be in one of its messages."""
    told = {}
    for entry in table.derived:
        told.setdefault(entry.by, set()).update(entry.keys)
    for key in table.keys:
        for part in key.writers:
            if part in told and key.name not in told[part] and key.name not in ADDED and key.places != ["event"]:
                yield f"key {key.name}: {part} writes it, and none of its messages has it"


def faults_of_report(table, report):
    if not re.fullmatch("[a-z]+( [a-z]+)*", report.name):
        yield "its name isn't words"
    if not report.text.endswith("."):
        yield "its text is no sentence"
    if report.category not in [row.name for row in table.categories]:
        yield f"there is no category {report.category}"
    if report.type not in [row.name for row in table.types]:
        yield f"there is no type {report.type}"
    keys = {key.name: key for key in table.keys if "message" in key.places and not key.is_pattern()}
    for what in ("key", "argument"):
        names = [getattr(each, what) for each in report.fields]
        yield from (f"{what} {name} stands twice" for name in repeated(filter(None, names)))
    for each in report.fields:
        if each.key not in keys:
            yield f"there is no key {each.key}"
        elif fault := fault_of_field(each, keys[each.key]):
            yield f"{each.key} {fault}"


def fault_of_field(each, key):
    kinds = {"boolean": bool, "integer": int, "number": float, "text": str}
    if key.kind not in kinds:
        return "is of any kind"
    if (each.constant is None) != bool(each.argument):
        return "has either a value or an argument"
    if each.constant is not None and type(each.constant) is not kinds[key.kind]:
        return f"isn't {each.constant!r}"
    if each.argument and not re.fullmatch("[a-z]+", each.argument):
        return "has an argument whose name is no word"
    return "is no text of Hz" if each.hertz and (key.kind, key.unit) != ("text", "Hz") else ""
