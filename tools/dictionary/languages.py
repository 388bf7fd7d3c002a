# SPDX-License-Identifier: Apache-2.0
"""The constants that clients in C, C++ and Python include."""

import textwrap

from table import pascal, upper

COLUMNS = 120
NOTE = "Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this."


def c_header(table):
    lines = ["/* What can be said: numbers and keys of messages, each after what it means, a key with its kind, unit",
             " * and range. docs/messages.md tells who reads and writes them. Constants alone: no library is needed.",
             " *", f" * {NOTE} */", "#pragma once", "", "#include <stdint.h>", "", "/* clang-format off */"]

    def numbers(title, prefix, rows, macro, show=str):
        lines.extend(["", f"/* {title} */", ""])
        for row in rows:
            lines.extend([*c_comment(row.text),
                          f"#define TARN_{prefix}_{upper(row.called())} {macro}({show(row.number)})"])

    numbers("Categories. A domain may be added: TARN_DOMAIN_DSP | TARN_CATEGORY_PLAYBACK.", "CATEGORY",
            table.categories, "UINT32_C")
    numbers("Domains of a category.", "DOMAIN", table.domains, "UINT32_C", "0x{:08X}".format)
    numbers("Types.", "TYPE", table.types, "UINT16_C")
    numbers("Service types.", "SERVICE", table.services, "UINT16_C")
    for section, keys in sections(table):
        lines.extend(["", f"/* {section}. */", ""])
        for key in keys:
            lines.extend([*c_comment(f"{key.text} ({key.measure()})"),
                          f'#define TARN_{key_word(key)} "{key.name.rstrip("*")}"'])
    return "\n".join(lines) + "\n\n/* clang-format on */\n"


def cpp_header(table):
    lines = ["// What can be said: numbers and keys of messages, for C++17 and later. docs/messages.md tells more.",
             "//", f"// {NOTE}", "#pragma once", "", "#include <cstdint>", "#include <string_view>", "",
             "namespace tarnreporting {"]

    def numbers(title, kind, rows, base, show=str):
        lines.extend(["", f"// {title}", f"enum class {kind} : std::{base} {{"])
        for row in rows:
            lines.extend(comment("  // ", row.text) + [f"  {pascal(row.called())} = {show(row.number)},"])
        lines.append("};")

    numbers("Categories.", "Category", table.categories, "uint32_t")
    numbers("Domains: Domain::DSP | Category::Playback.", "Domain", table.domains, "uint32_t", "0x{:08X}".format)
    lines.extend(["", "constexpr Category operator|(Domain domain, Category category) noexcept {",
                  "  return static_cast<Category>(static_cast<std::uint32_t>(domain) | "
                  "static_cast<std::uint32_t>(category));", "}"])
    numbers("Types.", "Type", table.types, "uint16_t")
    numbers("Service types.", "ServiceType", table.services, "uint16_t")
    lines.extend(["", "namespace keys {"])
    for section, keys in sections(table):
        lines.extend(["", f"// {section}."])
        for key in keys:
            ending = "Prefix" if key.is_pattern() else ""
            lines.extend(comment("// ", f"{key.text} ({key.measure()})"))
            lines.append(f'inline constexpr std::string_view k{pascal(key.name)}{ending} = "{key.name.rstrip("*")}";')
    return "\n".join(lines) + "\n\n}  // namespace keys\n\n}  // namespace tarnreporting\n"


def python_module(table):
    lines = ['"""What can be said: numbers and keys of messages. docs/messages.md tells what they mean.', "", NOTE,
             '"""', "", "from enum import IntEnum", "from typing import Final", ""]

    def numbers(kind, title, rows, show=str):
        lines.extend(["", f"class {kind}(IntEnum):", f'    """{title}"""', ""])
        lines.extend(f"    {upper(row.called())} = {show(row.number)}" for row in rows)
        lines.append("")

    numbers("Category", "What a message is about. A domain may be added: Domain.DSP | Category.PLAYBACK.",
            table.categories)
    numbers("Domain", "The high half of a category.", table.domains, "0x{:08X}".format)
    numbers("Type", "What happened.", table.types)
    numbers("ServiceType", "What a session is for.", table.services)
    lines.extend(["", "class Key:", '    """The keys of messages and of configurations; after each its kind, unit and'
                  ' range."""'])
    for section, keys in sections(table):
        lines.extend(["", f"    # {section}."])
        for key in keys:
            name = key_word(key).removeprefix("KEY_")
            lines.append(f'    {name}: Final[str] = "{key.name.rstrip("*")}"  # {key.measure()}')
    return "\n".join(lines) + "\n"


def sections(table):
    """(section, its keys) in the table's order, of the keys that clients want."""
    found = {}
    for key in table.keys:
        if key.is_constant():
            found.setdefault(key.section, []).append(key)
    return found.items()


def key_word(key):
    return ("KEY_PREFIX_" if key.is_pattern() else "KEY_") + upper(key.name)


def c_comment(text):
    return ("/* " + "\n * ".join(textwrap.wrap(text, COLUMNS - 6, break_long_words=False)) + " */").split("\n")


def comment(lead, text):
    return textwrap.wrap(text, COLUMNS, initial_indent=lead, subsequent_indent=lead, break_long_words=False)
