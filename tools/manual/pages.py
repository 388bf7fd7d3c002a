# SPDX-License-Identifier: Apache-2.0
"""Makes the manual pages: of their templates in docs/manual, of the documents that they take parts of, and of the
programs' own tables of options (docs/manual/commands.json). So each text is written once.

A template is a document whose first line is `# NAME(SECTION): what it is`. These lines stand for others:

    <!-- options: PROGRAM -->           synopsis, options and commands of that program
    <!-- document: FILE -->             all of that document of docs/ but its title
    <!-- part: FILE, SECTION -->        one section of it, with its heading
    <!-- text: FILE, SECTION -->        the same without its heading

usage: pages.py markdown TEMPLATE       prints the page as a document: what the examples are tested in
       pages.py scdoc TEMPLATE          prints it as scdoc takes it
"""

import json
import os
import re
import sys

DOCUMENTS = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..", "docs")
INSERTION = re.compile(r"<!-- (options|document|part|text): ([\w./-]+)(?:, (.+?))? -->")


def commands():
    with open(os.path.join(DOCUMENTS, "manual", "commands.json"), encoding="utf-8") as file:
        return {program["name"]: program for program in json.load(file)}


def document(name):
    with open(os.path.join(DOCUMENTS, name), encoding="utf-8") as file:
        return file.read().split("\n", 1)[1].strip()


def section(name, title):
    """A section's lines up to the next heading of its rank; its heading is of the second rank."""
    lines, rank = [], 0
    for line in document(name).splitlines():
        heading = re.match(r"(#+) (.*)", line)
        if heading and rank and len(heading[1]) <= rank:
            break
        if heading and heading[2] == title:
            rank = len(heading[1])
        if rank:
            lines.append(line[rank - 2:] if heading else line)
    if not lines:
        raise SystemExit(f"pages.py: {name} has no section \"{title}\"")
    return "\n".join(lines).strip()


# --- the programs' tables, as a document ---

def spelling(option):
    """`-q`, `--socket PATH`, `NAME`: as a line of a list has it."""
    names = option["names"] or [option["positional"]]
    value = option.get("value", "")
    if not option["names"] or not value:
        return ", ".join(f"`{name}`" for name in names)
    if value.startswith("["):  # its sign is part of it
        return ", ".join(f"`{name}{value}`" for name in names)
    return ", ".join(f"`{name} {value}`" for name in names)


def usage_of(command, before=""):
    words = [before + command["name"]]
    for option in command["options"]:
        if option["names"] and option["names"][-1] in ("--help", "--version"):
            continue
        name = option["names"][-1] if option["names"] else option["positional"]
        value = option.get("value", "") if option["names"] else ""
        word = name + value if value.startswith("[") else f"{name} {value}".strip()
        word += "..." if option["repeated"] else ""
        words.append(word if option["required"] else f"[{word}]")
    if command["commands"]:
        words.append("COMMAND [ARGUMENT...]")
    return " ".join(words)


def table_of(options):
    def cell(text):
        return text.replace("|", "\\|")

    rows = [f"| {cell(spelling(option))} | {cell(option['text'])} |" for option in options]
    return "\n".join(["| option | meaning |", "|---|---|", *rows])


# Examples of help texts that nobody can run just so.
NOT_RUN = {"fleet": "it needs servers", "kill": "ends the machine's service", "top": "shows until it is interrupted"}


def footer_of(command):
    """The text that follows a program's help. Lines that are set in by two blanks are shown as they are."""
    lines = []
    for line in command["more"].strip("\n").splitlines():
        shown = line.startswith("  ")
        if shown != bool(lines and lines[-1].startswith("    ")):
            lines.append("")
            if shown and command["name"] in NOT_RUN:
                lines += [f"<!-- not run: {NOT_RUN[command['name']]} -->", ""]
        lines.append("  " + line if shown else line)
    return "\n".join(lines).strip("\n")


def command_text(command, before, rank):
    named = [option for option in command["options"] if option["names"] != ["-h", "--help"]]
    parts = [f"{'#' * rank} {before}{command['name']}", f"`{usage_of(command, before)}`", command["text"] + "."]
    parts += [table_of(named)] if named else []
    parts += [footer_of(command)] if command["more"] else []
    parts += [command_text(inner, f"{before}{command['name']} ", rank) for inner in command["commands"]]
    return "\n\n".join(parts)


def options_of(name):
    program = commands()[name]
    parts = ["## Synopsis", f"`{usage_of(program)}`", "## Options", table_of(program["options"])]
    if program["commands"]:
        parts.append("## Commands")
        parts += [command_text(command, "", 3) for command in program["commands"]]
    return "\n\n".join(parts)


def expanded(template):
    def insertion(match):
        kind, name, title = match.groups()
        if kind == "options":
            return options_of(name)
        if kind == "document":
            return document(name)
        text = section(name, title)
        return text if kind == "part" else text.split("\n", 1)[1].strip()

    with open(template, encoding="utf-8") as file:
        return INSERTION.sub(insertion, file.read())


# --- a document, as scdoc takes it ---

def escaped(text):
    return re.sub(r"([\\*_`+#~<>])", r"\\\1", text)


def inline(text):
    """One paragraph's marks. What stands between back quotes is bold, of a link its words stay."""
    text = re.sub(r"\[([^\]]+)\]\([^)]+\)", r"\1", text).replace("\\|", "|")
    pieces = re.split(r"`([^`]+)`", text)
    shown = "".join(f"*{escaped(piece)}*" if index % 2 else escaped(piece) for index, piece in enumerate(pieces))
    return "\\" + shown if shown[:1] in tuple("-.|[];:&") else shown


def row_of(line):
    return [cell.strip() for cell in re.split(r"(?<!\\)\|", line.strip()[1:-1])]


def term(heads, cells):
    """The first cell, and the others, which tell their heads unless there is only one."""
    first = f"{heads[0]} {cells[0]}" if heads[1:] == [""] else cells[0]
    said = [f"{head}: {cell}" if len(cells) > 2 else cell for head, cell in zip(heads[1:], cells[1:]) if cell]
    return inline(first) + ("\n\t" + inline("; ".join(said)) if said else "")


def side_by_side(heads, rows):
    """The columns of each of the tables that share the lines: an empty column parts them, or a head after a column
    that has none."""
    groups = [[]]
    for place, head in enumerate(heads):
        if not head and not any(row[place] for row in rows):
            groups.append([])
            continue
        if head and groups[-1] and not heads[groups[-1][-1]]:
            groups.append([])
        groups[-1].append(place)
    return groups


def table(lines):
    """A list of terms."""
    heads, *rows = [row_of(line) for line in lines[:1] + lines[2:]]
    return "\n\n".join(term([heads[place] for place in columns], [row[place] for place in columns])
                       for columns in side_by_side(heads, rows) for row in rows if row[columns[0]])


def blocks(text):
    """(kind, lines) of each block: heading, code, table, list, text."""
    kind, lines, fenced = None, [], False
    for line in re.sub(r"<!--.*?-->", "", text, flags=re.DOTALL).splitlines() + [""]:
        if line.startswith("```"):
            fenced = not fenced
            line = ""
        elif fenced:
            line = "    " + line
        found = ("code" if line.startswith("    ") and (kind in (None, "code")) else
                 "heading" if line.startswith("#") else "table" if line.startswith("|") else
                 "list" if re.match(r"(?:- |\d+\. )", line) or (kind == "list" and line.startswith("  ")) else
                 "text" if line.strip() else None)
        if found != kind:
            if kind:
                yield kind, lines
            kind, lines = found, []
        lines.append(line)


def items(lines):
    text = "\n".join(re.sub(r"^(?:- |(\d+)\. )", lambda match: "\0" + (". " if match[1] else "- "), line)
                     for line in lines)
    return [" ".join(item.split()) for item in text.split("\0") if item]


def scdoc(text):
    title = re.match(r"# (\S+)\((\d)\): (.*)", text)
    name, number, purpose = title.groups()
    out = [f'{name}({number}) "" "tarnkit"', "# NAME", f"{name} - {purpose}"]
    for kind, lines in blocks(text[title.end():]):
        if kind == "heading":
            for line in lines:
                marks, words = line.split(" ", 1)
                words = words.replace("`", "")
                out.append("# " + words.upper() if len(marks) == 2 else "## " + words)
        elif kind == "code":
            shown = "\n".join(line[4:] for line in lines).replace("\\", "\\\\")
            out.append("```\n" + shown.strip("\n") + "\n```")
        elif kind == "table":
            out.append(table(lines))
        elif kind == "list":
            out.append("\n".join(item[:2] + inline(item[2:]) for item in items(lines)))
        else:
            out.append(inline(" ".join(" ".join(lines).split())))
    return "\n\n".join(out) + "\n"


def main(arguments):
    if len(arguments) != 2 or arguments[0] not in ("markdown", "scdoc"):
        raise SystemExit(__doc__)
    text = expanded(arguments[1])
    sys.stdout.reconfigure(encoding="utf-8")  # whatever the locale
    sys.stdout.write(text if arguments[0] == "markdown" else scdoc(text))


if __name__ == "__main__":
    main(sys.argv[1:])
