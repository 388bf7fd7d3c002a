# SPDX-License-Identifier: Apache-2.0
"""Who may include whom. The folders are floors: a file looks at its own folder and at those below, never up.

The table here is the rule; the code only reads it. A new folder that no row knows is a finding by itself.
"""

import os
import re

from tree import Finding, code_only

VALUES = ("plist", "plist/formats")
BASE = VALUES + ("platform",)
SESSION = BASE + ("service/vocabulary", "session")
DIAGNOSTICS = ("diagnostics", "diagnostics/pylon", "diagnostics/snare", "diagnostics/drivers")
TELEMETRY = ("telemetry/rtc", "telemetry/registration", "telemetry/trace")
WORKERS = ("derived",) + DIAGNOSTICS + TELEMETRY
# The host's rooms stand on these two.
GROUND = BASE + ("host/system", "host/log")
HOST = ("host/system", "host/log", "host/loop", "host/socket", "host/settings", "host/machine", "host/drivers",
        "host/ring", "host/traces", "host/traces/analysis", "host/check")
# The recorder's database, and what lies beside it.
STORE = ("recorder/store", "recorder/store/files", "recorder/store/rows", "recorder/store/reading",
         "recorder/store/retention")
PROGRAM = SESSION + WORKERS + ("service", "wire", "recorder") + STORE + HOST + ("host",)

# Each folder, from the ground up, and what its files may include beside files of its own. The worker families don't
# know each other: they meet through the session.
ROOMS = {
    "plist": (),
    "plist/formats": ("plist",),
    "wire": ("plist",),
    # What outside programs see stands on nothing else of ours.
    "client/include/tarnkit": (),
    "client": ("plist", "wire", "client/include/tarnkit"),
    "client/tarnkit": ("plist", "wire", "client", "client/include/tarnkit"),
    # What a client and the service share of a ring; the C library, whose header stands on nothing.
    "clients/ring": (),
    "clients/c/include": (),
    "clients/c/src": ("clients/ring", "clients/c/include"),
    # What can be said, as data, and the constants that are made of it.
    "dictionary": (),
    "platform": VALUES,
    "service/vocabulary": BASE,
    "session": BASE + ("service/vocabulary",),
    **{folder: SESSION for folder in WORKERS},
    "service": SESSION + WORKERS,
    "recorder/store/files": BASE,
    "recorder/store/rows": BASE + ("recorder/store/files",),
    # How the store forgets.
    "recorder/store/retention": BASE + ("recorder/store/files", "recorder/store/rows"),
    "recorder/store": BASE + ("recorder/store/files", "recorder/store/rows", "recorder/store/retention"),
    "recorder/store/reading": BASE + ("recorder/store/files", "recorder/store/rows", "recorder/store/retention",
                                      "recorder/store"),
    "recorder": BASE + ("service/vocabulary",) + STORE,
    "host/system": BASE,
    "host/log": BASE + ("host/system",),
    "host/loop": GROUND,
    "host/ring": GROUND + ("host/loop", "wire", "clients/ring"),
    "host/socket": GROUND + ("host/loop", "host/ring", "wire"),
    "host/settings": GROUND + ("host/loop", "host/socket", "recorder"),
    "host/check": GROUND + ("host/settings", "recorder/store"),
    "host/machine": GROUND + ("wire",),
    "host/drivers": GROUND,
    # Loaded by the service and linked to nothing of it: the facility's interface is all that it knows.
    "host/traces/analysis": BASE,
    "host/traces": GROUND + ("host/traces/analysis", "wire"),
    "host": GROUND + HOST + ("recorder",),
    # What PipeWire knows of streams: a model of it, and what joins it to PipeWire and to the C library.
    "adapters/pipewire/core": (),
    "adapters/pipewire/graph": ("adapters/pipewire/core",),
    "adapters/pipewire": VALUES + ("adapters/pipewire/core", "adapters/pipewire/graph", "host/settings"),
    # The same of ALSA, whose sub-devices are streams by the same model.
    "adapters/alsa": VALUES + ("adapters/pipewire/core", "adapters/pipewire", "host/drivers"),
    "testing/backends": BASE,
    "testing": BASE + ("service/vocabulary", "testing/backends"),
    "tools/script": PROGRAM,
    "tools/mutate": (),
    "tools/report": VALUES + ("host/system",) + STORE,
    "tools/ctl/terminal": PROGRAM,
    # What carries records of many devices to one place.
    "fleet/program": VALUES + ("host/system", "host/settings"),
    "fleet/format": VALUES + ("recorder/store/retention",),
    "fleet/privacy": VALUES + ("recorder/store",),
    "fleet/store": VALUES + STORE,
    "fleet/cursor": VALUES + STORE + ("fleet/store", "host/system"),
    "fleet/publish": VALUES + ("fleet/cursor", "fleet/format", "host/system", "recorder/store/retention"),
    "fleet/export": VALUES + STORE + (
        "fleet/cursor", "fleet/publish", "fleet/format", "fleet/privacy", "fleet/program", "fleet/store",
        "host/loop", "host/settings", "host/system", "tools/ctl/terminal", "wire"),
    "fleet/collect": VALUES + (
        "fleet/format", "fleet/program", "fleet/publish", "host/system", "recorder/store/retention",
        "tools/ctl/terminal"),
    "fleet/ask": VALUES + ("fleet/collect", "recorder/store", "tools/ctl/terminal", "tools/report"),
    "tools/ctl": PROGRAM + ("client", "dictionary", "tools/script", "tools/ctl/terminal"),
    "tools/ctl/sessions": PROGRAM + ("tools/ctl", "tools/ctl/terminal", "tools/report", "tools/script"),
    "tools/ctl/views": PROGRAM + ("client", "tools/ctl", "tools/ctl/terminal", "tools/report"),
    "tools/manual": PROGRAM + ("tools/ctl", "adapters/pipewire", "fleet/ask", "fleet/collect", "fleet/export"),
    # What checks the service shares no code with it, but for the client and the reader of the recorder's file.
    "tests/scenario": VALUES + ("client", "wire", "recorder/store/rows", "recorder/store", "recorder/store/reading"),
}
# Folders, with all below them, whose files may look at everything.
TRIALS = ("tests", "bench", "fuzz", "examples")
# The entry point owns no behaviour: it puts together what the folders hold.
ENTRY = "service/main.cpp"

# Rooms that stand on the standard library alone, so that they move to another platform as they are.
PORTABLE = set(SESSION + WORKERS) | {"service", "wire", "client", "client/include/tarnkit", "client/tarnkit", "testing",
                                     "testing/backends"}

# A concrete worker is known to its own source, to the table of classes and to tests; everyone else meets an interface.
CONCRETE_WORKER = re.compile(r"/TarnReportingSession[A-Za-z]+Worker\.h$")
CLASS_TABLE = "service/TarnReportingWorkerClasses.cpp"

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
# Differs by compiler, not by platform.
CONDITIONAL_HEADERS = ("plist/ThreadSafety.h",)
CONDITIONAL = re.compile(r"^[ \t]*#[ \t]*(?:if|ifdef|ifndef|elif)\b", re.MULTILINE)


def room_of(path):
    """The folder whose rule holds for a file; None for a file in a folder without one."""
    folder = os.path.dirname(path)
    if folder in ROOMS:
        return folder
    return next((trial for trial in TRIALS if folder == trial or folder.startswith(trial + "/")), None)


def may_include(path, room, wanted):
    return wanted == room or room in TRIALS or wanted in (PROGRAM if path == ENTRY else ROOMS[room])


def includes(text):
    """(line, path, whether it is ours) for each include of a file. Public headers go by their installed names."""
    code = code_only(text)
    for match in INCLUDE.finditer(code):
        line = code.count("\n", 0, match.start(1 if match.group(1) else 2)) + 1
        public = match.group(2) and match.group(2).startswith("tarnkit/")
        yield line, "client/include/" + match.group(2) if public else match.group(1) or match.group(2), \
            bool(public or match.group(1))


def check(tree):
    files = tree.cxx()
    findings = []
    for path, text in files.items():
        room = room_of(path)
        if room is None:
            findings.append(Finding(path, 1, "no row of tools/lint/include_graph.py knows this folder"))
            continue
        if path.endswith(".h") and "#pragma once" not in text:
            findings.append(Finding(path, 1, "a header wants #pragma once"))
        if is_portable(path, room) and path not in CONDITIONAL_HEADERS:
            for match in CONDITIONAL.finditer(code_only(text)):
                line = text.count("\n", 0, match.start()) + 1
                findings.append(Finding(path, line, "no conditional code here: what differs by platform is a facility"))
        for line, target, quoted in includes(text):
            fault = quoted_fault(path, room, target, files) if quoted else system_fault(path, room, target)
            if fault:
                findings.append(Finding(path, line, fault))
    return sorted(findings + circles(files))


def is_portable(path, room):
    return room in PORTABLE and path != ENTRY


def quoted_fault(path, room, target, files):
    if target not in files:
        return f'"{target}" is no file of this tree, as seen from its root'
    wanted = room_of(target)
    if not may_include(path, room, wanted):
        return f"{room} may not include {wanted} ({target})"
    own = target.removesuffix(".h") == path.removesuffix(".cpp")
    if CONCRETE_WORKER.search("/" + target) and not own and path != CLASS_TABLE and room not in TRIALS:
        return f"{target} is a concrete worker: only the table of classes knows it"
    return None


def system_fault(path, room, target):
    if not is_portable(path, room) or target in STANDARD or (room == "client" and target in POSIX_SOCKETS):
        return None
    return f"{room} stands on the standard library alone, and <{target}> is none of it"


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
