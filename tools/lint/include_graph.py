"""Who may include whom. The folders are floors: a file looks at its own floor and at those below, never up.

The tables here are the rule; the code only reads them. A new folder or file that fits no row is a finding by itself.
"""

import fnmatch
import re

from tree import Finding, code_only

# The first row whose pattern fits names a file's floor.
FLOORS = (
    ("plist/*", "plist"),
    ("wire/*", "wire"),
    ("client/*", "client"),
    ("platform/linux/*", "linux"),
    ("platform/recorder/*", "recorder"),
    ("platform/testing/*", "fakes"),
    ("platform/*.h", "platform"),
    ("service/main.cpp", "entry"),
    ("service/TarnReportingWorkerClasses.cpp", "classes"),
    ("service/TarnReportingService*", "front"),
    ("service/TarnReportingClient*", "front"),
    ("service/TarnReportingSession*", "front"),
    ("service/TarnReportingWorkerClasses.h", "front"),
    ("service/*", "vocabulary"),
    ("session/*", "session"),
    ("derived/*", "derived"),
    ("diagnostics/*", "diagnostics"),
    ("telemetry/*", "telemetry"),
    ("tools/*", "tools"),
    ("tests/*", "tests"),
    ("bench/*", "tests"),
    ("fuzz/*", "tests"),
)

BASE = {"plist", "platform"}
SESSION = BASE | {"vocabulary", "session"}
FRONT = SESSION | {"front", "derived", "diagnostics", "telemetry"}
PROGRAM = FRONT | {"wire", "linux", "recorder"}

# What each floor may include. The worker families don't know each other: they meet through the session.
ALLOWED = {
    "plist": {"plist"},
    "wire": {"plist", "wire"},
    "client": {"plist", "wire", "client"},
    "platform": BASE,
    "vocabulary": BASE | {"vocabulary"},
    "session": SESSION,
    "derived": SESSION | {"derived"},
    "diagnostics": SESSION | {"diagnostics"},
    "telemetry": SESSION | {"telemetry"},
    "front": FRONT,
    "classes": FRONT,
    "linux": BASE | {"wire", "vocabulary", "linux"},
    "recorder": BASE | {"vocabulary", "linux", "recorder"},
    "fakes": BASE | {"vocabulary", "fakes"},
    "entry": PROGRAM,
    "tools": PROGRAM | {"client", "tools"},
    "tests": PROGRAM | {"client", "tools", "fakes", "tests"},
}

# Floors that stand on the standard library alone, so that they move to another platform as they are.
PORTABLE = {"plist", "wire", "client", "platform", "vocabulary", "session", "derived", "diagnostics", "telemetry",
            "front", "classes", "fakes"}

# A concrete worker is known to its own source, to the table of classes and to tests; everyone else meets an interface.
CONCRETE_WORKER = re.compile(r"/TarnReportingSession[A-Za-z]+Worker\.h$")
KNOWS_WORKERS = {"classes", "tests"}

# The client library stands on sockets, beside the standard library.
POSIX_SOCKETS = set("fcntl.h poll.h sys/socket.h sys/stat.h sys/types.h sys/uio.h sys/un.h unistd.h".split())

STANDARD = set("""
algorithm any array atomic barrier bit bitset cassert cctype cerrno cfenv cfloat charconv chrono cinttypes climits
clocale cmath compare complex concepts condition_variable coroutine csetjmp csignal cstdarg cstddef cstdint cstdio
cstdlib cstring ctime cuchar cwchar cwctype deque exception execution filesystem forward_list fstream functional future
initializer_list iomanip ios iosfwd iostream istream iterator latch limits list locale map memory memory_resource mutex
new numbers numeric optional ostream queue random ranges ratio regex scoped_allocator semaphore set shared_mutex span
sstream stack stdexcept streambuf string string_view system_error thread tuple type_traits typeindex typeinfo
unordered_map unordered_set utility valarray variant vector version
""".split())

INCLUDE = re.compile(r'^[ \t]*#[ \t]*include[ \t]*(?:"([^"\n]+)"|<([^>\n]+)>)', re.MULTILINE)
CONDITIONAL = re.compile(r"^[ \t]*#[ \t]*(?:if|ifdef|ifndef|elif)\b", re.MULTILINE)


def floor_of(path):
    for pattern, floor in FLOORS:
        if fnmatch.fnmatchcase(path, pattern):
            return floor
    return None


def includes(text):
    """(line, path, whether in quotes) for each include of a file."""
    code = code_only(text)
    for match in INCLUDE.finditer(code):
        yield code.count("\n", 0, match.start(1 if match.group(1) else 2)) + 1, match.group(1) or match.group(2), \
            bool(match.group(1))


def check(tree):
    files = tree.cxx()
    findings = []
    for path, text in files.items():
        floor = floor_of(path)
        if floor is None:
            findings.append(Finding(path, 1, "no row of tools/lint/include_graph.py places this file on a floor"))
            continue
        if path.endswith(".h") and "#pragma once" not in text:
            findings.append(Finding(path, 1, "a header wants #pragma once"))
        if floor in PORTABLE:
            for match in CONDITIONAL.finditer(code_only(text)):
                line = text.count("\n", 0, match.start()) + 1
                findings.append(Finding(path, line, "no conditional code here: what differs by platform is a facility"))
        for line, target, quoted in includes(text):
            fault = quoted_fault(path, floor, target, files) if quoted else system_fault(floor, target)
            if fault:
                findings.append(Finding(path, line, fault))
    return sorted(findings + circles(files))


def quoted_fault(path, floor, target, files):
    if target not in files:
        return f'"{target}" is no file of this tree, as seen from its root'
    wanted = floor_of(target)
    if wanted not in ALLOWED[floor]:
        return f"{floor} may not include {wanted} ({target})"
    own = target.removesuffix(".h") == path.removesuffix(".cpp")
    if CONCRETE_WORKER.search("/" + target) and not own and floor not in KNOWS_WORKERS:
        return f"{target} is a concrete worker: only the table of classes knows it"
    return None


def system_fault(floor, target):
    if floor not in PORTABLE or target in STANDARD or (floor == "client" and target in POSIX_SOCKETS):
        return None
    return f"{floor} stands on the standard library alone, and <{target}> is none of it"


def circles(files):
    """One finding for each include that closes a circle."""
    graph = {path: [(line, target) for line, target, quoted in includes(text) if quoted and target in files]
             for path, text in files.items()}
    done, findings = set(), []

    def visit(path, trail):
        done.add(path)
        for line, target in graph[path]:
            if target in trail:
                circle = trail[trail.index(target):] + [target]
                findings.append(Finding(path, line, "includes in a circle: " + " -> ".join(circle)))
            elif target not in done:
                visit(target, trail + [target])

    for path in graph:
        if path not in done:
            visit(path, [path])
    return findings
