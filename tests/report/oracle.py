# SPDX-License-Identifier: Apache-2.0
"""The numbers of a report, straight from the file by SQL: what the page must say."""

import json
import math
import sqlite3

PREFIX = "sys.oxbow.tarnkit."
HOUR, DAY = 3600.0, 86400.0


class Oracle:
    def __init__(self, path, since=-math.inf, until=math.inf, now=None):
        self.database = sqlite3.connect(f"file:{path}?mode=ro", uri=True)
        self.since, self.until, self.now = since, until, now
        self.sessions = {row[0]: row for row in self.database.execute(
            "SELECT id, application, service_name, created, ended, process, pid, end_reason FROM sessions "
            "WHERE created < ?1 AND (ended IS NULL OR ended >= ?2) AND NOT (coalesce(end_reason, '') = 'retyped' "
            "AND id NOT IN (SELECT session FROM periods))", (until, since))}
        self.messages = [(session, time, name[len(PREFIX):], json.loads(payload)) for session, time, name, payload in
                         self.database.execute("SELECT session, time, name, payload FROM events "
                                               "WHERE backend = 'tally' AND substr(name, 1, ?) = ? "
                                               "AND session IS NOT NULL AND time >= ? AND time < ? ORDER BY id",
                                               (len(PREFIX), PREFIX, since, until))
                         if session in self.sessions]

    def periods(self, session=None):
        for row in self.database.execute("SELECT session, started, stopped, messages, redundant FROM periods "
                                         "WHERE started < ? AND (stopped IS NULL OR stopped >= ?)",
                                         (self.until, self.since)):
            if row[0] in self.sessions and session in (None, row[0]):
                ended = self.sessions[row[0]][4]
                stopped = row[2] if row[2] is not None else ended if ended is not None else self.now
                yield (row[0], max(row[1], self.since), min(stopped, self.until), row[3], row[4])

    def active(self, session=None):
        return sum(stopped - started for _, started, stopped, _, _ in self.periods(session))

    @staticmethod
    def kind(name, payload):
        category, _, kind = name.rpartition(".")
        if category == "Flume" or (kind == "Summary" and category in ("Volume", "Input", "Lagoon", "Session_Generic")):
            return "derived"
        if payload.get("issue_type") == "overload" and "session_duration" not in payload:
            return "overload"
        if kind == "IssueDetector":
            return "issue"
        return "error" if kind == "Error" or category == "Error" or category.endswith("_Error") else "plain"

    def count(self, kind, session=None):
        return sum(1 for owner, _, name, payload in self.messages
                   if session in (None, owner) and self.kind(name, payload) == kind)

    def overload_times(self):
        return [time for _, time, name, payload in self.messages if self.kind(name, payload) == "overload"]

    def play_seconds(self):
        buckets = [0.0] * 17
        for _, _, name, payload in self.messages:
            if name == "Volume.Summary":
                buckets[min(16, math.floor(payload["KvSessionVolume"] * 16 + 0.5))] += payload["play_seconds"]
        return buckets

    def segments(self, session):
        return [(payload["play_seconds"], payload["KvSessionVolume"], payload["active_devices"])
                for owner, _, name, payload in self.messages if owner == session and name == "Volume.Summary"]

    def volumes(self, session):
        found = []
        for owner, _, name, payload in self.messages:
            if owner == session and self.kind(name, payload) != "derived" and "KvSessionVolume" in payload:
                if not found or found[-1] != payload["KvSessionVolume"]:
                    found.append(payload["KvSessionVolume"])
        return found
