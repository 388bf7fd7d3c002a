# SPDX-License-Identifier: Apache-2.0
"""Damage of every kind to every file of the state directory, one at a time; then the service starts. Either somebody is
told (a line in the log, a refusal), or nothing is missing: every row that was there is there as it was.
"""

import os
import shutil
import sqlite3
import subprocess
import time

import wire
from account import FIRST, begin_session, message
from service import settled

KEY, MESSAGES, UNCHECKPOINTED = 1, 400, 60
ALL = "SELECT id, time, backend, name, payload, detail, session FROM events ORDER BY id"
# What can't change any more.
ENDED = ("SELECT * FROM runs WHERE ended IS NOT NULL ORDER BY id",
         "SELECT * FROM sessions WHERE ended IS NOT NULL ORDER BY id",
         "SELECT * FROM periods WHERE stopped IS NOT NULL ORDER BY id")
PAGE = 4096
WRONG_USAGE = 64


def flip(random, data):
    at = random.randrange(len(data) * 8)
    data[at // 8] ^= 1 << at % 8
    return f"bit {at % 8} of byte {at // 8} flipped"


def cut(random, data):
    size = random.randrange(len(data))
    del data[size:]
    return f"cut at {size}"


def pages_of(data):
    return max(1, (len(data) + PAGE - 1) // PAGE)


def zero(random, data):
    page = random.randrange(pages_of(data))
    part = data[page * PAGE:(page + 1) * PAGE]
    data[page * PAGE:(page + 1) * PAGE] = bytes(len(part))
    return f"page {page} zeroed"


def swap(random, data):
    whole = len(data) // PAGE
    if whole < 2:
        return flip(random, data)
    first, second = random.sample(range(whole), 2)
    one, other = data[first * PAGE:(first + 1) * PAGE], data[second * PAGE:(second + 1) * PAGE]
    data[first * PAGE:(first + 1) * PAGE], data[second * PAGE:(second + 1) * PAGE] = other, one
    return f"pages {first} and {second} swapped"


# Single bits are the bar; the others come now and then.
DAMAGES = (flip,) * 7 + (cut, zero, swap)


def rows_of(service):
    """Of events, and of runs, sessions and periods that are over."""
    reader = service.reader()
    try:
        return [reader.execute(sql).fetchall() for sql in (ALL, *ENDED)]
    finally:
        reader.close()


def fill(service, first, count):
    with service.connect() as client:
        begin_session(client, KEY)
        for number in range(first, first + count):
            client.call(wire.SEND, message(KEY, number), wire.PLAYBACK, wire.PLAYBACK_START, [KEY])
        settled(client)


def test_session(service):
    """Leaves a summary file."""
    with service.connect() as client:
        client.call(wire.CREATE, KEY + 1)
        client.call(wire.RETYPE, 11, KEY + 1)
        client.send(wire.START, KEY + 1)
        client.call(wire.SEND, {"tone": 440}, wire.PLAYBACK, wire.PLAYBACK_START, [KEY + 1])
        client.call(wire.STOP, KEY + 1)
        settled(client)


def write(path, data):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "wb") as file:
        file.write(data)


def damaged_ground(context):
    """A state directory as a kill leaves it, a log beside the database; and the rows that are in it."""
    service = context.new_service()
    write(os.path.join(service.state, "defaults", "sys.oxbow.tarnkit.json"), b'{"device_name": "bench"}\n')
    write(os.path.join(service.state, "notifications", "sys.oxbow.homeshell.ringerstate"), bytes(8))
    write(os.path.join(service.state, "flume", "amp.json"),
          b'{"driver": "OxbowAmp<0x12>", "channels": [{"name": "hits", "format": "simple", "unit": "n", "value": 3}]}')
    start(service)
    fill(service, FIRST, MESSAGES)
    test_session(service)
    if service.stop() != 0:
        raise RuntimeError("the service doesn't end well")
    start(service)
    fill(service, FIRST + MESSAGES, UNCHECKPOINTED)
    with service.connect() as client:
        # A connection's end is recorded too, and what isn't committed by the kill would be told of.
        while client.call(wire.STATUS)["connections_open"] > 1:
            time.sleep(0.01)
        settled(client)
        rows = rows_of(service)
        service.kill()
    return service.state, rows


def start(service):
    if not service.start():
        raise RuntimeError(f"the service doesn't start: {service.log_text()[-500:]}")


def files_below(folder):
    paths = [os.path.relpath(os.path.join(at, name), folder) for at, _, names in os.walk(folder) for name in names]
    return sorted(path for path in paths if os.path.getsize(os.path.join(folder, path)) > 0)


class Trials:
    def __init__(self, context, figures):
        self.context, self.figures = context, figures
        self.ground, self.rows = damaged_ground(context)
        self.files = files_below(self.ground)
        self.service = context.new_service()

    def lay_out(self):
        shutil.rmtree(self.service.state, ignore_errors=True)
        shutil.copytree(self.ground, self.service.state)
        self.service.forget_log()

    def untouched(self):
        """Without damage nobody complains: else every damage would seem to be seen."""
        self.lay_out()
        start(self.service)
        if not self.is_whole() or self.end() != 0 or self.service.log_text().strip() or self.check_tells():
            raise RuntimeError(f"an undamaged state directory is complained of: {self.service.log_text()[-500:]}")

    def one(self):
        random = self.context.random
        path = random.choice(self.files)
        self.lay_out()
        target = os.path.join(self.service.state, path)
        with open(target, "rb") as file:
            data = bytearray(file.read())
        what = random.choice(DAMAGES)(random, data)
        with open(target, "wb") as file:
            file.write(data)
        self.judge(path, what)

    def judge(self, path, what):
        try:
            started = self.service.start(patience=20)
        except TimeoutError as problem:
            self.context.fail(f"{path}, {what}: {problem}")
            return
        died = not started and self.service.process.returncode < 0
        harmless = started and self.is_whole()
        status = self.end() if started else self.service.process.returncode
        line = self.service.log_text().strip()
        if died or (status is not None and status < 0):
            self.figures["deaths"] += 1
            self.context.fail(f"{path}, {what}: the service died with {status}: {line[-300:]}")
        elif line:
            self.figures["seen"] += 1
        elif harmless:
            self.figures["harmless"] += 1
        elif self.check_tells():
            self.figures["seen"] += 1
            self.figures["seen_by_check"] += 1
        else:
            self.figures["unseen"] += 1
            self.context.fail(f"{path}, {what}: rows differ and nobody is told")

    def check_tells(self):
        """Whether the tool that looks a store through complains; one that can't look (wrong usage) says nothing."""
        program = os.path.join(os.path.dirname(self.service.program), "tarnreportingctl")
        words = [program, "--state-dir", self.service.state, "check", "--store"]
        return subprocess.run(words, capture_output=True, timeout=60).returncode not in (0, WRONG_USAGE)

    def is_whole(self):
        """Whether the rows that were there are there as they were. What the service checks at its leisure, it is asked
        to look at by the message."""
        try:
            fill(self.service, FIRST + MESSAGES + UNCHECKPOINTED, 1)
            return all(now[:len(before)] == before for now, before in zip(rows_of(self.service), self.rows))
        except (sqlite3.Error, wire.WireError, wire.Refused, OSError, UnicodeError):
            self.figures["unreadable"] += 1
            return False

    def end(self):
        if not self.service.is_running():
            return self.service.process.returncode
        return self.service.stop()


def run(context, figures):
    figures.update(files=0, tried=0, seen=0, seen_by_check=0, harmless=0, unseen=0, unreadable=0, deaths=0)
    trials = Trials(context, figures)
    figures["files"] = len(trials.files)
    trials.untouched()
    while context.left() > 0:
        trials.one()
        figures["tried"] += 1
    tried = max(1, figures["tried"])
    figures["seen_or_harmless_percent"] = 100 * (figures["seen"] + figures["harmless"]) / tried
