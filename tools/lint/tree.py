# SPDX-License-Identifier: Apache-2.0
"""The files that the checks look at, as texts by path, and the means to look at code without its comments.

A check takes a Tree and returns findings, so that its tests can hand it a tree of their own making.
"""

import functools
import os
import re
import subprocess
from dataclasses import dataclass

CXX = (".cpp", ".h")
SCRIPTS = (".py", ".sh")
TEXTS = CXX + SCRIPTS + (".c", ".hpp", ".md", ".txt", ".cmake", ".toml", ".json", ".jsonl", ".service", ".socket",
                         ".conf", ".in")
# Seeds of the fuzzers are meant to be wrong.
RAW = ("fuzz/corpus/",)
NAMES = ("dev", "run", ".clang-tidy", ".clang-format", ".gitignore")


@dataclass(frozen=True, order=True)
class Finding:
    path: str
    line: int
    text: str

    def __str__(self):
        return f"{self.path}:{self.line}: {self.text}"


class Tree:
    """Texts by path, relative to the root, with `/` between the parts."""

    def __init__(self, files):
        self.files = dict(sorted(files.items()))

    @staticmethod
    def at(root):
        files = {}
        for path in listed(root):
            if path.startswith(RAW):
                continue
            if path.endswith(TEXTS) or os.path.basename(path) in NAMES:
                with open(os.path.join(root, path), encoding="utf-8", errors="surrogateescape", newline="") as file:
                    files[path] = file.read()
        return Tree(files)

    def cxx(self):
        return {path: text for path, text in self.files.items() if path.endswith(CXX)}


def listed(root):
    """The paths of the tree: what git tracks or would track, or every file outside build/ where there is no git."""
    command = ["git", "ls-files", "-z", "--cached", "--others", "--exclude-standard"]
    try:
        out = subprocess.run(command, cwd=root, check=True, capture_output=True).stdout.decode()
        paths = [path for path in out.split("\0") if path]
    except (OSError, subprocess.CalledProcessError):
        paths = [os.path.relpath(os.path.join(folder, name), root)
                 for folder, _, names in os.walk(root) for name in names]
        paths = [path for path in paths if not path.startswith(("build" + os.sep, ".git" + os.sep))]
    return sorted(path for path in set(paths) if os.path.isfile(os.path.join(root, path)))


TOKEN = re.compile(
    r"""//[^\n]*|/\*.*?\*/"""
    r"""|R"(?P<tag>[^()\s\\]{0,16})\(.*?\)(?P=tag)\""""
    r"""|"(?:\\.|[^"\\\n])*"|(?<![0-9A-Fa-f])'(?:\\.|[^'\\\n])*'""",
    re.DOTALL)


@functools.lru_cache(maxsize=None)
def code_only(text):
    """The text with comments and literals blanked, line by line where they were; include lines stay whole."""

    def blank(match):
        found = match.group(0)
        start = text.rfind("\n", 0, match.start()) + 1
        if found.startswith('"') and text[start:match.start()].lstrip().startswith("#include"):
            return found
        return re.sub(r"[^\n]", " ", found)

    return TOKEN.sub(blank, text)


def matches(code, pattern):
    """(line, match) for each match of a compiled pattern."""
    for match in pattern.finditer(code):
        yield code.count("\n", 0, match.start()) + 1, match
