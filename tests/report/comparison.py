# SPDX-License-Identifier: Apache-2.0
"""Compares the tables of a page with the numbers that SQL says."""

import calendar
import math
import time

import oracle
import page_reader

HOUR, DAY = oracle.HOUR, oracle.DAY


def moment(text):
    form = "%Y-%m-%d %H:%M:%S"
    return calendar.timegm(time.strptime(text, form[:8] if len(text) == 10 else form))


class Differences(list):
    def same(self, what, found, expected, slack=0.001):
        if isinstance(found, (int, float)) and isinstance(expected, (int, float)):
            if math.isclose(found, expected, rel_tol=1e-9, abs_tol=slack):
                return
        elif found == expected:
            return
        self.append(f"{what}: {found!r} in the page, {expected!r} by SQL")


def shown(name):
    """A client's text as a page shows it."""
    def character(each):
        code = ord(each)
        hidden = code < 0x20 or 0x7F <= code < 0xA0 or 0x200E <= code <= 0x200F or 0x202A <= code <= 0x202E
        return f"\\u{code:04x}" if hidden else each
    text = name if len(name) <= 60 else name[:60] + "\u2026"
    return "".join(character(each) for each in text) or "unknown"


def overview(tables, truth, differences):
    same = differences.same
    facts = page_reader.facts(tables["All sessions together"])
    periods = list(truth.periods())
    same("sessions", facts["Sessions"], len(truth.sessions))
    same("active hours", facts["Active, h"], truth.active() / HOUR)
    same("messages", facts["Messages"], sum(row[3] for row in periods))
    same("repeated", facts["Repeated messages"], sum(row[4] for row in periods))
    for kind, row in (("overload", "Overloads"), ("error", "Errors"), ("issue", "Issues")):
        same(row, facts[row], truth.count(kind))
    groups(tables, truth, differences)
    for index, seconds in enumerate(truth.play_seconds()):
        same(f"play at {index}/16", tables["Volume"][index][1], seconds)
    days(tables, truth, differences)


def groups(tables, truth, differences):
    expected = {}
    for session, application, service, *_ in truth.sessions.values():
        row = expected.setdefault((shown(application), service), [0, 0.0, 0, 0])
        row[0] += 1
        row[1] += truth.active(session) / HOUR
        row[2] += truth.count("overload", session)
        row[3] += truth.count("error", session)
    found = {(row[0], row[1]): row[2:] for row in tables["Sessions by application and type"]
             if not str(row[0]).endswith(" others")}
    if len(expected) <= 20:
        differences.same("groups", sorted(found), sorted(expected))
    for key, row in found.items():
        for index, number in enumerate(expected.get(key, [None] * 4)):
            differences.same(f"{key} column {index}", row[index], number)


def days(tables, truth, differences):
    """That the bins hold all of it, each its own share."""
    periods = list(truth.periods())
    differences.same("hours of all days", sum(row[2] for row in tables["Active hours a day"]), truth.active() / HOUR,
                     0.001 * (1 + len(tables["Active hours a day"])))
    for day, length, hours, rate in tables["Active hours a day"]:
        begin = moment(day)
        end = begin + length * DAY
        active = sum(max(0.0, min(row[2], end) - max(row[1], begin)) for row in periods) / HOUR
        differences.same(f"hours of {day}", hours, active)
        differences.same(f"hours a day of {day}", rate, active / length)
    times = truth.overload_times()
    for start, length, hours, count, rate in tables["Overloads an hour"]:
        begin = moment(start)
        differences.same(f"overloads from {start}", count,
                         sum(1 for each in times if begin <= each < begin + length * HOUR))
        differences.same(f"overloads an hour from {start}", rate, count / hours if hours else 0.0,
                         0.001 + rate * 0.001 / hours if hours else 0.001)


def rows(tables, truth, differences):
    """The table of all sessions, and the worst of them."""
    found = {row[0]: row for row in tables["All sessions, the newest first"]}
    differences.same("rows", sorted(found), sorted(truth.sessions))
    faults = {}
    for session, application, service, _, ended, process, pid, reason in truth.sessions.values():
        row = found[session]
        counts = [truth.count(kind, session) for kind in ("overload", "error", "issue")]
        faults[session] = counts[0] + counts[1]
        periods = list(truth.periods(session))
        expected = [shown(application), service, f"{shown(process)} {pid}", truth.active(session),
                    sum(period[3] for period in periods), sum(period[4] for period in periods), *counts,
                    "open" if ended is None else reason]
        for index, number in enumerate(expected):
            differences.same(f"session {session} column {index + 2}", row[index + 2], number)
    worst = [(row[0], row[4] + row[5]) for row in tables["The worst sessions"]]
    expected = sorted((count for count in faults.values() if count), reverse=True)[:10]
    differences.same("faults of the worst", [count for _, count in worst], expected)
    for session, count in worst:
        differences.same(f"faults of session {session}", count, faults[session])


def section(tables, truth, session, differences):
    """A session by itself. Its lanes may be thinned, so counts are compared, and volumes where they are few."""
    same, name = differences.same, f"Session {session}: "
    facts = page_reader.facts(tables[name + "facts"])
    for kind, row in (("overload", "Overloads"), ("error", "Errors"), ("issue", "Issues")):
        same(f"{name}{row}", facts[row], truth.count(kind, session))
    same(name + "active", facts["Active, s"], truth.active(session))
    segments = truth.segments(session)
    found = [(row[1], row[2], row[3]) for row in tables.get(name + "derived segments", [])]
    if len(segments) <= 40:
        same(name + "how many segments", len(found), len(segments))
        for place, (row, expected) in enumerate(zip(found, segments)):
            for index in range(3):
                same(f"{name}segment {place} column {index}", row[index], expected[index])
    else:
        same(name + "longest segments", round(sum(row[0] for row in found), 1),
             round(sum(sorted((row[0] for row in segments), reverse=True)[:40]), 1), 0.2)
    volumes = truth.volumes(session)
    drawn = [row[3] for row in tables[name + "timeline"] if row[1] == "volume"]
    if len(volumes) <= 60:
        same(name + "volumes", [round(volume, 3) for volume in volumes], drawn)
    marks = [row for row in tables[name + "timeline"] if row[1] == "overload"]
    joined = sum(int(str(row[3]).rpartition(", ")[2].split()[0]) if str(row[3]).endswith("from then on") else 1
                 for row in marks)
    same(name + "overloads of the timeline", joined, truth.count("overload", session))
