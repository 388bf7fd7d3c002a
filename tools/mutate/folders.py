# SPDX-License-Identifier: Apache-2.0
"""Which test programs hold each folder's rules, the folder's own first. Folders are walked with what is below them.

A program's second part is a filter: tests that take long, or that use threads or other programs, come last or are left
out with `-`.
"""

STRESS = "-*Stress*:*Protoc*"

FOLDERS = {
    "wire": ("tests_wire", "tests_client"),
    "service": ("tests_vocabulary", "tests_service"),
    "session": ("tests_session", "tests_service", "tests_derived"),
    "derived": ("tests_derived",),
    "diagnostics": ("tests_diagnostic_tools", "tests_snare", "tests_metrics", "tests_drivers"),
    "telemetry": ("tests_registration", "tests_trace", "tests_rtc"),
}

FILTERS = {
    "tests_snare": STRESS,
    "tests_metrics": STRESS,
    "tests_rtc": STRESS,
    "tests_client": STRESS,
}

# Never changed: the entry point, which no unit test runs.
LEFT_OUT = ("main.cpp",)


def filter_of(program):
    return FILTERS.get(program, "*")
