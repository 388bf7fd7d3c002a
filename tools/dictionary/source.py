# SPDX-License-Identifier: Apache-2.0
"""dictionary/MessageTable.cpp: the table as tarnreportingctl looks at it."""

import math

from languages import NOTE

KINDS = {"boolean": "Boolean", "integer": "Integer", "number": "Number", "text": "Text", "any": "Any"}
LISTS = (("NamedNumber", "Categories"), ("NamedNumber", "Domains"), ("NamedNumber", "Types"),
         ("NamedNumber", "ServiceTypes"), ("MessageKey", "Keys"), ("DerivedMessage", "Derived"), ("KeyPart", "Parts"))


def source(table):
    lines = ["// The table of what can be said.", "//", f"// {NOTE}", "#include <array>", "",
             '#include "dictionary/MessageDictionary.h"', "", "namespace tarn::dictionary {", "", "namespace {", "",
             "// One entry a line.", "// clang-format off"]
    for name, entries in (("Categories", table.categories), ("Domains", table.domains), ("Types", table.types),
                          ("ServiceTypes", table.services)):
        array(lines, "NamedNumber", name, [
            f"{{{row.number}U, {text(row.name)}, {text(row.text)}, {boolean(row.by_name)}}}" for row in entries])
    array(lines, "MessageKey", "Keys", [key_row(key) for key in table.keys])
    array(lines, "DerivedMessage", "Derived", [derived_row(entry) for entry in table.derived])
    array(lines, "KeyPart", "Parts", [f"{{{text(part.name)}, {text(part.text)}}}" for part in table.parts])
    lines += ["", "// clang-format on", "", "}  // namespace", ""]
    for kind, name in LISTS:
        function = name[0].lower() + name[1:]
        lines += [f"std::span<const {kind}> {function}() {{", f"  return k{name};", "}", ""]
    return "\n".join(lines) + "\n}  // namespace tarn::dictionary\n"


def array(lines, kind, name, entries):
    lines += ["", f"constexpr std::array<{kind}, {len(entries)}> k{name}{{{{"]
    lines += [f"    {entry}," for entry in entries] + ["}};"]


def key_row(key):
    least, greatest = key.range or (-math.inf, math.inf)
    members = [text(key.name), f"KeyKind::{KINDS[key.kind]}", text(key.unit), bound(least), bound(greatest),
               boolean("message" in key.places), boolean("configuration" in key.places)]
    members += [text(listed(each)) for each in (key.values, key.only_in, key.readers, key.writers)]
    return "{" + ", ".join(members + [text(key.text), text(key.derives)]) + "}"


def derived_row(entry):
    name = entry.event or f"{entry.category}.{entry.type}"
    script = "".join(f"{line}\n" for line in entry.script())
    recorded = "".join(f"{line}\n" for line in entry.recorded())
    members = [text(name), text(entry.by), text(entry.when), text(entry.text), text(listed(entry.keys)),
               text(entry.example["text"]), raw(script), raw(recorded)]
    return "{" + ", ".join(members) + "}"


def listed(names):
    return ", ".join(names)


def bound(value):
    return ("-" if value < 0 else "") + "kUnbounded" if math.isinf(value) else f"{value}.0"


def boolean(value):
    return "true" if value else "false"


def text(value):
    return '"' + value.replace("\\", "\\\\").replace('"', '\\"') + '"'


def raw(value):
    return f'R"({value})"'
