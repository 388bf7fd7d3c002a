# SPDX-License-Identifier: Apache-2.0
"""Calls that this code doesn't make, each with what to use in its place.

A row: what is banned, where it is allowed all the same (path patterns), and the substitute.
"""

import fnmatch
import re
from dataclasses import dataclass

from tree import Finding, code_only, matches

HOST = ("host/*", "recorder/*", "service/main.cpp", "tools/*", "client/*", "clients/*", "adapters/*",
        "fleet/*")
TRIALS = ("tests/*", "bench/*", "fuzz/*")
# Where time is the real one: real programs, the real machine's folders, and two adapters that have nothing to wait on.
REAL_TIME = ("tests/adapters/*", "tests/e2e/*", "tests/scenario/*", "tests/host/*", "tests/recorder/*",
             "tests/client/*", "tests/clients/*", "tests/campaigns/shim/RingPoster.cpp",
             "tests/campaigns/shim/SessionPlayer.cpp", "clients/c/src/Client.cpp",
             "tests/*Stress*", "bench/*", "tools/*", "host/system/FileLock.cpp",
             "recorder/store/reading/EventReader.cpp")
# A fatal check on our own mistakes, where there is no log yet or no longer.
LAST_WORDS = ("service/vocabulary/ProcessState.cpp", "service/vocabulary/TarnReportingServerQueue.cpp", "testing/*")
# Locks that clang doesn't check: what the checked ones are made of; those of the fakes, the tools and the tests, which
# don't ship; and one that guards nothing of its own, since the platform's Condition hands it out.
UNCHECKED_LOCKS = ("plist/ThreadSafety.h", "testing/*", "tools/*", *TRIALS, "host/loop/LinuxConditions.cpp")
NOWHERE = ()


@dataclass(frozen=True)
class Ban:
    pattern: str
    allowed: tuple
    substitute: str

    def regex(self):
        return re.compile(self.pattern)


def call(names):
    """A call of one of these free functions, by any name: not a member, nor one of another namespace than std."""
    return rf"(?<![\w.>:~])(?:std::|::)?(?:{names})\s*\("


def qualified(names):
    """The same for names so common that only `std::` or `::` before them tells the function."""
    return rf"(?<![\w.>:~])(?:std::|::)(?:{names})\s*\("


BANS = (
    Ban(r"\bsleep_(?:for|until)\b", REAL_TIME, "a manual clock and a queue that the test runs"),
    Ban(call("usleep|nanosleep|clock_nanosleep") + "|" + qualified("sleep"), REAL_TIME,
        "a manual clock and a queue that the test runs"),
    Ban(r"\b(?:system|steady|high_resolution|utc)_clock\b", HOST + TRIALS, "platform::Clock"),
    Ban(call("gettimeofday|clock_gettime|localtime_r|gmtime_r|mktime|strftime") + "|" + qualified("time|clock") +
        r"|(?<![\w.>:~])time\s*\(\s*(?:nullptr|NULL|0|&\w+)\s*\)", HOST + TRIALS,
        "platform::Clock, platform::LocalCalendar"),
    Ban(call("localtime|gmtime|ctime|asctime"), NOWHERE, "localtime_r or gmtime_r, in an adapter"),
    Ban(call("getenv|secure_getenv|setenv|putenv|unsetenv"), HOST + TRIALS,
        "an option, or a fact that the platform hands over"),
    Ban(r"\bstd::(?:basic_)?[io]?fstream\b|\bstd::filesystem\b", HOST + TRIALS, "platform::FileSystem"),
    Ban(call("fopen|freopen|tmpfile|openat|creat") + "|" + qualified("open"), HOST + TRIALS, "platform::FileSystem"),
    Ban(call("rand|srand|srandom|drand48") + "|" + qualified("random"), NOWHERE, "std::mt19937_64 with a printed seed"),
    Ban(r"\bstd::random_device\b", HOST + TRIALS, "platform::RandomSource"),
    Ban(call("strerror|strerror_r|perror"), NOWHERE, "std::generic_category().message(code)"),
    Ban(r"\bstd::endl\b", NOWHERE, "'\\n'"),
    Ban(r"\bstd::(?:cout|cerr|clog|cin)\b", ("service/main.cpp", "tools/*", *TRIALS, "host/*", "fleet/export/main.cpp"),
        "the logging helper"),
    Ban(call("printf|fprintf|vprintf|vfprintf|puts|fputs|putchar"),
        ("service/main.cpp", "tools/*", *TRIALS, "host/*", "adapters/*", "fleet/*",
                                                                   *LAST_WORDS), "the logging helper"),
    Ban(call("sprintf|vsprintf|asprintf|vasprintf"), NOWHERE, "std::to_chars and append, or std::snprintf"),
    Ban(call("strcpy|strcat|strncpy|strtok|gets"), NOWHERE, "std::string, std::string_view"),
    Ban(call("atoi|atol|atoll|atof|strtol|strtoll|strtoul|strtoull|strtod|strtof|sscanf"), NOWHERE, "std::from_chars"),
    Ban(r"(?<!operator)(?<!operator )(?<!::)\bnew\b(?!\s*>)|::new\b(?!\s*\()", ("plist/*", "platform/UniqueFunction.h"),
        "std::make_unique or std::make_shared"),
    Ban(r"(?<!operator)(?<!operator )(?<!=)(?<!= )\bdelete\b", ("plist/*", "platform/UniqueFunction.h"),
        "a type that owns"),
    # The C library stands on the C library: the C++ runtime would end the process where memory runs out. The reserve is
    # what stands behind operator new.
    Ban(call("malloc|calloc|realloc|free"),
        ("plist/*", "bench/*", "clients/c/src/*", "host/system/MemoryReserve.cpp"), "a container"),
    Ban(r"\bstd::(?:thread|async|jthread)\b(?!::id)", (*HOST, *TRIALS, "testing/*"), "platform::WorkQueues"),
    Ban(r"\b(?:(?:const|mutable|static)\s+)*std::(?:(?:recursive_)?mutex|lock_guard|unique_lock|scoped_lock)\b",
        UNCHECKED_LOCKS, "Mutex and MutexLock of plist/ThreadSafety.h, whose use clang checks"),
    Ban(call("exit|_exit|quick_exit|_Exit"), ("service/main.cpp", "tools/*", "host/*", *TRIALS),
        "platform::ProcessControl"),
    Ban(call("popen"), ("bench/figures/PostFigures.cpp",), "platform::CommandRunner"),
    Ban(call("system"), NOWHERE, "platform::CommandRunner"),
    Ban(r"\bGTEST_SKIP\b|\bDISABLED_\w+", NOWHERE, "a test that runs, or none"),
    Ban(r"\bFRIEND_TEST\b|\bfriend\s+(?:class|struct)\s+\w*Test\w*", NOWHERE, "a seam: tests use the front door"),
    Ban(r"\busing\s+namespace\s+std\s*;", NOWHERE, "the names themselves"),
)


def check(tree):
    bans = [(ban, ban.regex()) for ban in BANS]
    findings = []
    for path, text in tree.cxx().items():
        code = code_only(text)
        for ban, regex in bans:
            if any(fnmatch.fnmatchcase(path, pattern) for pattern in ban.allowed):
                continue
            for line, match in matches(code, regex):
                if is_preprocessor(code, match.start()) or is_declaration(code, match.start()):
                    continue
                found = match.group(0).strip(" (\n")
                findings.append(Finding(path, line, f"{found} is not used here; use {ban.substitute}"))
    return sorted(findings)


DECLARED = re.compile(r"(?<![\w])(?!(?:return|co_return|throw|else|case|do)\s)[\w:]+(?:<[^;{}]*>)?[&*]*\s+$")


def is_declaration(code, position):
    """Whether a type stands right before the name, as in `Status open(`."""
    start = code.rfind("\n", 0, position) + 1
    return DECLARED.search(code[start:position]) is not None


def is_preprocessor(code, position):
    start = code.rfind("\n", 0, position) + 1
    return code[start:position].lstrip().startswith("#")
