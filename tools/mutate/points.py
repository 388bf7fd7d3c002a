# SPDX-License-Identifier: Apache-2.0
"""Finds the places of a source where a small change makes a mutant, by clang's syntax tree.

A mutant is a range of one file, what stands there, and what stands there in its place. Those of `built` kind sit where
the compiler needs a constant, so that they can't be chosen at run time.
"""

import os
import re
from dataclasses import dataclass, field

from clang.cindex import CursorKind as Kind
from clang.cindex import Index, TypeKind

RELATIONS = {"<": ("<=", ">="), "<=": ("<", ">"), ">": (">=", "<="), ">=": (">", "<"), "==": ("!=",), "!=": ("==",)}
LOGICAL = {"&&": ("||",), "||": ("&&",)}
ARITHMETIC = {"+": ("-",), "-": ("+",), "*": ("/",), "/": ("*",), "%": ("*",), "&": ("|",), "|": ("&",),
              "<<": (">>",), ">>": ("<<",)}
COMPOUND = {"+=": "-=", "-=": "+=", "*=": "/=", "/=": "*=", "|=": "&=", "&=": "|=", "<<=": ">>=", ">>=": "<<="}
INTEGERS = {TypeKind.INT, TypeKind.UINT, TypeKind.LONG, TypeKind.ULONG, TypeKind.LONGLONG, TypeKind.ULONGLONG,
            TypeKind.SHORT, TypeKind.USHORT, TypeKind.CHAR_S, TypeKind.SCHAR, TypeKind.UCHAR}
NUMBERS = INTEGERS | {TypeKind.FLOAT, TypeKind.DOUBLE}
FUNCTIONS = {Kind.FUNCTION_DECL, Kind.CXX_METHOD, Kind.CONSTRUCTOR, Kind.DESTRUCTOR, Kind.CONVERSION_FUNCTION,
             Kind.FUNCTION_TEMPLATE}
# What the compiler works out itself, or what isn't code that runs.
PASSED_OVER = {Kind.STATIC_ASSERT, Kind.ENUM_DECL, Kind.CXX_UNARY_EXPR, Kind.TYPE_ALIAS_DECL, Kind.TYPEDEF_DECL,
               Kind.TYPE_ALIAS_TEMPLATE_DECL, Kind.CONCEPT_DECL if hasattr(Kind, "CONCEPT_DECL") else Kind.ENUM_DECL}
JUMPS = {Kind.BREAK_STMT, Kind.CONTINUE_STMT}
INTEGER = re.compile(r"(0[xX][0-9a-fA-F']+|[0-9][0-9']*)([uUlLzZ]*)$")
FLOATING = re.compile(r"([0-9']*\.?[0-9']*(?:[eE][+-]?[0-9]+)?)([fFlL]?)$")
ASSIGNMENT = re.compile(r"[\w.:>\[\]-]+ = ")
STATEMENT_CALL = re.compile(r"(?:(\w+)\s*(?:\.|->|\(|<))")


@dataclass
class Mutant:
    file: str
    start: int
    end: int
    before: str
    after: str
    kind: str  # "expression", "removed", "swapped"; `built` tells what needs a build of its own
    built: bool = False
    truth: bool = False  # what stands there is true or false, whatever its type
    line: int = 0
    text: str = ""  # the whole line, without its indentation
    occurrence: int = 1
    id: int = 0
    mate: tuple = field(default=(), repr=False)  # of a swap: the range of the statement that follows

    def change(self):
        if self.kind == "removed":
            return f"{shown(self.before)} left out"
        if self.kind == "swapped":
            return f"{shown(self.before)} after {shown(self.after[:-len(self.before)])}"
        return f"{shown(self.before)} -> {shown(self.after)}"


def shown(text):
    text = " ".join(text.split())
    return text if len(text) <= 70 else text[:67] + "..."


class Finder:
    """Walks one translation unit and keeps what belongs to `files`: texts by absolute path."""

    def __init__(self, files):
        self.files = files
        self.found = {}

    def add(self, path, start, end, after, kind="expression", built=False, truth=False, mate=()):
        text = self.files[path]
        before = text[start:end]
        key = (path, start, end, after, kind)
        if before and before != after and key not in self.found:
            self.found[key] = Mutant(path, start, end, before, after, kind, built, truth, mate=mate)

    def parse(self, source, arguments):
        unit = Index.create().parse(source, args=arguments)
        wrong = [each for each in unit.diagnostics if each.severity >= 3]
        if wrong:
            raise RuntimeError(f"{source}: {wrong[0]}")
        for cursor in unit.cursor.get_children():
            if cursor.location.file is not None and os.path.realpath(cursor.location.file.name) in self.files:
                self.walk(cursor, os.path.realpath(cursor.location.file.name), None, False)

    def walk(self, cursor, path, parent, built):
        kind = cursor.kind
        if kind in PASSED_OVER:
            return
        start, end = cursor.extent.start.offset, cursor.extent.end.offset
        head = self.files[path][start:end]
        if kind in FUNCTIONS and re.search(r"\bconst(?:expr|eval)\b", head.split("{")[0].split("(")[0]):
            return
        if kind == Kind.VAR_DECL and re.match(r"(?:\w+\s+)*const(?:expr|init)\b", head):
            built = True
        self.look_at(cursor, kind, path, head, parent, built)
        children = list(cursor.get_children())
        if kind == Kind.CASE_STMT:
            children = children[1:]
        elif kind == Kind.IF_STMT and re.match(r"if\s+constexpr\b", head):
            children = children[1:]
        elif kind in (Kind.VAR_DECL, Kind.FIELD_DECL):
            children = [each for each in children if each.extent.start.offset > cursor.location.offset]
        for child in children:
            self.walk(child, path, cursor, built)

    def look_at(self, cursor, kind, path, text, parent, built):
        start, end = cursor.extent.start.offset, cursor.extent.end.offset
        if kind in (Kind.BINARY_OPERATOR, Kind.COMPOUND_ASSIGNMENT_OPERATOR, Kind.CALL_EXPR, Kind.UNEXPOSED_EXPR):
            self.operator(cursor, kind, path, start, end, built)
        elif kind == Kind.UNARY_OPERATOR:
            self.unary(cursor, path, start, end, text, built)
        elif kind in (Kind.INTEGER_LITERAL, Kind.FLOATING_LITERAL, Kind.CXX_BOOL_LITERAL_EXPR, Kind.STRING_LITERAL,
                      Kind.CHARACTER_LITERAL):
            self.literal(kind, path, start, end, text, parent, built)
        elif kind == Kind.IF_STMT and not re.match(r"if\s+constexpr\b", text):
            self.condition(next(cursor.get_children(), None), path)
        elif kind == Kind.CONDITIONAL_OPERATOR:
            self.condition(next(cursor.get_children(), None), path)
        elif kind == Kind.RETURN_STMT:
            value = next(cursor.get_children(), None)
            if value is not None and value.type.get_canonical().kind == TypeKind.BOOL:
                self.condition(value, path)
        if kind == Kind.COMPOUND_STMT:
            self.statements(list(cursor.get_children()), path, in_block=True)
        elif kind in (Kind.IF_STMT, Kind.FOR_STMT, Kind.WHILE_STMT, Kind.CXX_FOR_RANGE_STMT, Kind.CASE_STMT,
                      Kind.DEFAULT_STMT):
            bodies = list(cursor.get_children())
            self.statements(bodies[1:] if kind == Kind.IF_STMT else bodies[-1:], path, in_block=False)

    def operator(self, cursor, kind, path, start, end, built):
        sides = list(cursor.get_arguments()) if kind == Kind.CALL_EXPR else list(cursor.get_children())
        if len(sides) != 2 or any(side is None for side in sides):
            return
        left, right = sides
        between = (left.extent.end.offset, right.extent.start.offset)
        if not start <= between[0] < between[1] <= end:
            return
        text = self.files[path]
        found = text[between[0]:between[1]].strip()
        if kind == Kind.COMPOUND_ASSIGNMENT_OPERATOR:
            others = (COMPOUND[found],) if found in COMPOUND and is_number(cursor) else ()
        else:
            others = RELATIONS.get(found, ()) + LOGICAL.get(found, ())
            if found in ARITHMETIC and kind == Kind.BINARY_OPERATOR and is_number(left) and is_number(right):
                others += ARITHMETIC[found]
        for other in others:
            self.add(path, start, end, f"{text[start:between[0]]} {other} {text[between[1]:end]}", built=built,
                     truth=found in RELATIONS or found in LOGICAL)

    def unary(self, cursor, path, start, end, text, built):
        if text.startswith("!"):
            self.add(path, start, end, f"({text[1:]})", built=built, truth=True)
        elif text.startswith("-") and not text.startswith("--") and is_number(cursor):
            self.add(path, start, end, f"({text[1:]})", built=built)
        elif is_number(cursor):
            for sign, other in (("++", "--"), ("--", "++")):
                if text.startswith(sign):
                    self.add(path, start, end, other + text[2:])
                elif text.endswith(sign):
                    self.add(path, start, end, text[:-2] + other)

    def literal(self, kind, path, start, end, text, parent, built):
        afters = []
        if kind == Kind.CXX_BOOL_LITERAL_EXPR:
            afters = [{"true": "false", "false": "true"}.get(text)]
        elif kind == Kind.INTEGER_LITERAL and (match := INTEGER.match(text)):
            number = int(match.group(1).replace("'", ""), 0 if match.group(1)[:2] in ("0x", "0X") else 10)
            afters = [str(number + 1) + match.group(2)] + (["0" + match.group(2)] if number != 0 else [])
        elif kind == Kind.FLOATING_LITERAL and FLOATING.match(text):
            afters = [f"({text} + 1)"] + (["0.0" + FLOATING.match(text).group(2)] if float(FLOATING.match(
                text).group(1).replace("'", "")) != 0 else [])
        elif kind == Kind.STRING_LITERAL:
            afters = [other_text(text)]
        elif kind == Kind.CHARACTER_LITERAL and re.fullmatch(r"'[^\\]'", text):
            afters = ["'~'" if text != "'~'" else "'!'"]
        if parent is not None and parent.kind == Kind.VAR_DECL and self.files[path][start - 1:start] == "[":
            return
        for after in afters:
            if after:
                self.add(path, start, end, after, built=built)

    def condition(self, cursor, path):
        """Turned round, unless an operator in it is already."""
        if cursor is None or not cursor.kind.is_expression() or cursor.extent.start.file is None:
            return
        start, end = cursor.extent.start.offset, cursor.extent.end.offset
        text = self.files[path][start:end]
        if any(key[:3] == (path, start, end) for key in self.found) or text in ("true", "false"):
            return
        own = [each.extent for each in cursor.get_children()]
        if len(own) == 2:
            between = self.files[path][own[0].end.offset:own[1].start.offset].strip()
            if between in RELATIONS or between in ("=",):
                return
        if not text.startswith("!") or "&&" in text or "||" in text:
            self.add(path, start, end, f"!({text})", truth=True)

    def statements(self, cursors, path, in_block):
        text = self.files[path]
        ranges = []
        for cursor in cursors:
            start, end = cursor.extent.start.offset, cursor.extent.end.offset
            semicolon = re.compile(r"\s*;").match(text, end)
            jump = cursor.kind in JUMPS or (cursor.kind == Kind.RETURN_STMT and text[start:end] == "return")
            plain = is_action(cursor, text[start:end])
            if not semicolon or not (jump or plain):
                ranges.append(None)
                continue
            whole = (start, semicolon.end())
            self.add(path, *whole, "", kind="removed")
            ranges.append(whole if plain else None)
        for first, second in zip(ranges, ranges[1:]) if in_block else ():
            if first and second and same_target(text[slice(*first)], text[slice(*second)]):
                self.add(path, *first, f"{text[slice(*second)]} {text[slice(*first)]}", kind="swapped", mate=second)


def is_number(cursor):
    return cursor.type.get_canonical().kind in NUMBERS


def is_action(cursor, text):
    """An expression that stands alone as a statement and does something."""
    if not cursor.kind.is_expression() or re.match(r"(?:static_cast<void>\(\w+\)|\w+)$", text):
        return False
    return True


def same_target(first, second):
    """Calls of two functions, or of one object: where order may matter."""
    one, other = STATEMENT_CALL.match(first), STATEMENT_CALL.match(second)
    if not one or not other or first == second or (ASSIGNMENT.match(first) and ASSIGNMENT.match(second)):
        return False
    bare = one.group(0)[-1] == "(" and other.group(0)[-1] == "("
    return bare or one.group(1) == other.group(1)


def other_text(text):
    """A text of the same length with another letter, away from escapes and from what a format stands for."""
    if not text.startswith('"'):
        return None
    for match in re.finditer(r"\\.|%[-+ #0-9.*]*(?:hh|h|ll|l|z|j|t)?[a-zA-Z@%]|([A-Za-z0-9 _.,:;/=(){}<>-])", text):
        if match.group(1):
            other = "Q" if match.group(1) != "Q" else "q"
            return text[:match.start()] + other + text[match.end():]
    return None
