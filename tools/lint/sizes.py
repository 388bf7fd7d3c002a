"""How long a file may be: a longer one is two jobs. clang-tidy watches the length of functions."""

from tree import CXX, SCRIPTS, Finding

HEADER_LINES = 250
# Of those whose comments are the manual: they are installed, and their readers have nothing else.
INSTALLED_HEADER_LINES = 400
SOURCE_LINES = 600
SOURCE_LINES_USUALLY = 400
SHARE_OF_LONGER_SOURCES = 0.05
TEST_LINES = 800
SCRIPT_LINES = 400
COLUMNS = 120
NARROW = SCRIPTS + (".md", ".cmake", ".txt")


def limit_of(path):
    if path.startswith(("tests/", "testing/", "fuzz/", "bench/")) and path.endswith(CXX):
        return TEST_LINES
    if path.endswith(".h"):
        return INSTALLED_HEADER_LINES if "/include/" in path else HEADER_LINES
    if path.endswith(".cpp"):
        return SOURCE_LINES
    if path.endswith(SCRIPTS) or path in ("dev", ".ci/run"):
        return SCRIPT_LINES
    return None


def check(tree):
    findings = []
    for path, text in tree.files.items():
        lines = text.count("\n")
        limit = limit_of(path)
        if limit is not None and lines > limit:
            findings.append(Finding(path, lines, f"{lines} lines, where {limit} are the most: two jobs in one file"))
        if path.endswith(NARROW) or path in ("dev", ".ci/run"):
            findings += [Finding(path, number, f"{len(line)} columns, where {COLUMNS} are the most")
                         for number, line in enumerate(text.split("\n"), 1) if too_wide(line)]
    return sorted(findings + longer_than_usual(tree))


def too_wide(line):
    # A table row and a link can't be broken.
    return len(line) > COLUMNS and not line.lstrip().startswith("|") and "://" not in line


def longer_than_usual(tree):
    sources = {path: text.count("\n") for path, text in tree.files.items() if limit_of(path) == SOURCE_LINES}
    longer = sorted(path for path, lines in sources.items() if lines > SOURCE_LINES_USUALLY)
    if len(longer) <= max(1, SHARE_OF_LONGER_SOURCES * len(sources)):
        return []
    return [Finding(path, sources[path], f"one of {len(longer)} sources of more than {SOURCE_LINES_USUALLY} lines: "
                    "more than one in twenty") for path in longer]
