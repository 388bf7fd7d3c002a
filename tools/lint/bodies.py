#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Where the body of an if, an else or a loop stands. A body that only leaves (return, continue, break, throw) stands on
the line of its `if`, without braces, when both fit. Every other body has braces and lines of its own.

usage: bodies.py [--fix]    says what check.py would say of this; with --fix it rewrites the files (then format them)
"""

import os
import re
import sys
from dataclasses import dataclass

from tree import TOKEN, Finding, Tree, code_only

COLUMNS = 120
HEAD = re.compile(r"(?<![\w.>])(if|for|while|else)\b")
COMPOUND = re.compile(r"(if|for|while|do|switch|try)\b")
LEAVES = re.compile(r"(?:return|co_return|continue|break|throw)\b[^\n;]*;$")
ATTRIBUTE = re.compile(r"\s*\[\[[^\]]*\]\]")
MACRO = re.compile(r"^[ \t]*#(?:[^\n\\]|\\.|\\\n)*", re.MULTILINE)
CLOSING = {"(": ")", "{": "}", "[": "]"}

JOIN = "the body only leaves and fits: it stands on the line of its if, without braces"
BRACE = "this body wants braces and lines of its own"


@dataclass(frozen=True)
class Body:
    """A body of `text[start:end]`, whose head (`if (...)`, `else`, ...) is `text[head:start]`."""
    keyword: str
    head: int
    start: int
    end: int
    alone: bool  # no else follows


def check(tree):
    return sorted(Finding(path, text.count("\n", 0, body.head) + 1, why)
                  for path, text in tree.cxx().items() for body, why in faults(text))


def fixed(text):
    """The text with each body where it belongs; lines are as long as they come."""
    found = list(faults(text))
    while found:
        body, why = found[-1]  # what lies inside another comes after it
        inner = text[body.start:body.end].strip()
        if why == JOIN:
            text = text[:body.start].rstrip() + " " + unbraced(inner) + text[body.end:]
        else:
            text = text[:body.start].rstrip() + " {\n" + inner + "\n}" + text[body.end:]
        found = list(faults(text))
    return text


def faults(text):
    code = MACRO.sub(lambda found: re.sub(r"[^\n]", " ", found.group(0)), code_only(text))
    for body in bodies(code):
        braced = code[body.start] == "{"
        joined = body.keyword == "if" and body.alone and fits(text, code, body)
        if joined and (braced or "\n" in text[body.head:body.end]):
            yield body, JOIN
        elif not joined and not braced:
            yield body, BRACE


def fits(text, code, body):
    """Whether the body only leaves, without a word of comment, and has room on the line of its head."""
    head, inner = text[body.head:body.start].strip(), unbraced(text[body.start:body.end])
    commented = any(found.group(0).startswith("/") for found in TOKEN.finditer(text[body.head:body.end]))
    # An attribute would part them again: clang-format gives what comes after it a line of its own.
    if "\n" in head or head.endswith("]]") or commented or not LEAVES.match(unbraced(code[body.start:body.end])):
        return False
    column = body.head - text.rfind("\n", 0, body.head) - 1
    return column + len(head) + 1 + len(inner) <= COLUMNS


def unbraced(text):
    text = text.strip()
    return text[1:-1].strip() if text.startswith("{") else text


def bodies(code):
    """Each body of an if, an else and a loop, in the order of their heads."""
    found, of_do = [], set()
    for match in re.finditer(r"\bdo\b", code):  # its `while` has no body
        start = skip_blanks(code, match.end())
        end = end_of_statement(code, start)
        of_do.add(skip_blanks(code, end))
        found.append(Body("do", match.start(), start, end, False))
    for match in HEAD.finditer(code):
        keyword = match.group(1)
        if match.start() in of_do or (keyword == "else" and code[match.end():].lstrip().startswith("if")):
            continue
        start = end_of_head(code, match.start())
        end = end_of_statement(code, start)
        alone = not re.compile(r"else\b").match(code, skip_blanks(code, end)) and not after_else(code, match.start())
        found.append(Body(keyword, match.start(), start, end, alone))
    return sorted(found, key=lambda body: body.head)


def after_else(code, position):
    return re.search(r"\belse\s*$", code[:position]) is not None


def end_of_head(code, position):
    """Where the body begins whose `if`, `for`, `while`, `switch` or `else` stands here."""
    word = re.compile(r"\w+(?:\s+constexpr\b)?").match(code, position)
    position = skip_blanks(code, word.end())
    if word.group(0) != "else":
        position = skip_blanks(code, end_of_bracket(code, position))
    while found := ATTRIBUTE.match(code, position):
        position = skip_blanks(code, found.end())
    return position


def end_of_statement(code, position):
    """The end of the statement that begins here, with all the else that belongs to it."""
    if code.startswith("{", position):
        return end_of_bracket(code, position)
    compound = COMPOUND.match(code, position)
    if not compound:
        return end_of_simple(code, position)
    word = compound.group(1)
    if word in ("do", "try"):
        end = end_of_statement(code, skip_blanks(code, compound.end()))
        return end_of_simple(code, end) if word == "do" else end_of_bracket(code, code.index("{", end))
    end = end_of_statement(code, end_of_head(code, position))
    other = skip_blanks(code, end)
    if word == "if" and re.compile(r"else\b").match(code, other):
        return end_of_statement(code, end_of_head(code, other))
    return end


def end_of_simple(code, position):
    while code[position] != ";":
        position = end_of_bracket(code, position) if code[position] in CLOSING else position + 1
    return position + 1


def end_of_bracket(code, position):
    """The place after the bracket that closes the one here."""
    open_, close, depth = code[position], CLOSING[code[position]], 0
    for place in range(position, len(code)):
        depth += (code[place] == open_) - (code[place] == close)
        if depth == 0:
            return place + 1
    raise ValueError(f"a bracket that nothing closes: {code[position:position + 60]!r}")


def skip_blanks(code, position):
    while position < len(code) and code[position].isspace():
        position += 1
    return position


def main(arguments):
    if arguments not in ([], ["--fix"]):
        print("usage: bodies.py [--fix]", file=sys.stderr)
        return 64
    root = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
    tree = Tree.at(root)
    if not arguments:
        findings = check(tree)
        print(*findings, sep="\n", end="\n" if findings else "")
        return 1 if findings else 0
    for path, text in tree.cxx().items():
        if (mended := fixed(text)) != text:
            with open(os.path.join(root, path), "w", encoding="utf-8", errors="surrogateescape", newline="") as file:
                file.write(mended)
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
