# SPDX-License-Identifier: Apache-2.0
"""One system call after the other fails once, or is short, while a service starts, serves a short script and ends.

The script runs over a store that holds messages already. However the service takes the fault (it may refuse to start,
close a connection, refuse a request or end, each with a line), what was answered is in the store once afterwards, what
was there before is still there, and the next start serves.

A call is known by its site: its kind and the eight callers above it, as runs without a fault show them. Calls of one
site do the same, so of each the first, the middle and the last fail, in each way in which that kind of call may: that
is all. A site that a run doesn't reach, as threads take turns otherwise, is tried and not `fired`. A trial mostly
waits, for a store that tries again or for a peer, so some run side by side. PART is a share of the sites, as 2of5.
"""

import os
import shutil
import time
from collections import Counter, deque
from concurrent.futures import ThreadPoolExecutor

import control
import wire
from account import FIRST, begin_session, judge, message, rows_after
from service import settled

OLD, FIRST_NEW, SECOND_NEW = 1, 2, 3
OLD_MESSAGES, NEW_MESSAGES = 40, 8
RUNS_TO_LEARN = 3
SIDE_BY_SIDE = 4
COUNTED = ("tried", "fired", "refused_or_ended", "doubled", "committed_lost", "settled_lost", "late_lost", "set_aside")


class Script:
    """Two clients, each with numbered messages; a connection that breaks is made once more. What was answered and what
    was settled is kept in the form that account.judge takes."""

    class Side:
        def __init__(self, key):
            self.key, self.next = key, FIRST
            self.answers, self.refused, self.settled = [], set(), FIRST - 1

    def __init__(self, service, patience=10):
        self.service, self.patience = service, patience
        self.sides = [self.Side(FIRST_NEW), self.Side(SECOND_NEW)]
        self.problems = []

    def play(self):
        for side in self.sides:
            for _ in range(2):
                try:
                    self.play_side(side)
                    break
                except (wire.WireError, OSError) as problem:
                    self.problems.append(str(problem))
                    # What became of a request without a reply nobody knows: it may be there, once.
                    side.refused.update(set(range(FIRST, side.next)) - {number for _, numbers in side.answers
                                                                        for number in numbers})

    def play_side(self, side):
        with self.service.connect(self.patience) as client:
            try:
                begin_session(client, side.key)
                while side.next < FIRST + NEW_MESSAGES:
                    self.send(client, side)
                client.call(wire.SEND, {"large": "x" * 150000}, wire.PLAYBACK, 5, [side.key])
                client.call(wire.ALL_REPORTERS)
                client.call(wire.STOP, side.key)
            except wire.Refused as refusal:
                self.problems.append(str(refusal))
            settled(client, self.patience)
            side.settled = side.next - 1

    @staticmethod
    def send(client, side):
        number = side.next
        side.next += 1
        try:
            client.call(wire.SEND, message(side.key, number), wire.PLAYBACK, wire.PLAYBACK_START, [side.key])
            side.answers.append((time.monotonic(), [number]))
        except wire.Refused:
            side.refused.add(number)


def old_store(context):
    """A state directory that holds messages of an earlier run."""
    service = context.new_service()
    if not service.start():
        raise RuntimeError(f"the service doesn't start: {service.log_text()}")
    with service.connect() as client:
        begin_session(client, OLD)
        for number in range(FIRST, FIRST + OLD_MESSAGES):
            client.call(wire.SEND, message(OLD, number), wire.PLAYBACK, wire.PLAYBACK_START, [OLD])
        settled(client)
    if service.stop() != 0:
        raise RuntimeError(f"the service doesn't end well: {service.log_text()}")
    return service.state


class Trials:
    """One trial after the other, from the same old store, with figures of its own."""

    def __init__(self, context, old):
        self.context, self.old = context, old
        self.figures = Counter()
        self.control = context.new_control()
        self.environment = self.control.environment(context.shim("faults"))
        self.service = context.new_service()
        self.calls = {}
        self.sites = os.path.join(context.new_folder(), "sites")

    def learn(self):
        """How often each site calls, at the most, in some runs without a fault."""
        counts = Counter()
        environment = self.environment
        self.environment = {**environment, control.SITES_VARIABLE: self.sites}
        for _ in range(RUNS_TO_LEARN):
            if problem := self.one():
                raise RuntimeError(f"the script fails without a fault: {problem}")
            counts |= control.sites_in(self.sites)
            os.unlink(self.sites)
        self.environment = environment
        return counts

    def one(self, fault=None):
        """A run with one fault; what went wrong, or nothing."""
        shutil.rmtree(self.service.state, ignore_errors=True)
        shutil.copytree(self.old, self.service.state)
        self.service.forget_log()
        self.control.forget()
        if fault is not None:
            self.control.let_fail_at(*fault)
        script = Script(self.service)
        try:
            started = self.service.start(self.environment, patience=15)
            if started:
                script.play()
            ended_itself = not self.service.is_running()
            status = self.service.process.returncode if ended_itself else self.service.stop()
        except TimeoutError as problem:
            return str(problem)
        return self.verdict(script, status, ended_itself)

    def all_of(self, faults):
        """Takes faults until none is left, or no time; others take from the same."""
        while self.context.left() > 0:
            try:
                fault = faults.popleft()
            except IndexError:
                return
            problem = self.one(fault)
            self.figures["tried"] += 1
            if problem:
                kind, site, ordinal, how = fault
                self.context.fail(f"call {ordinal} of {kind} at {site:x} with {how}: {problem}")

    def verdict(self, script, status, ended_itself):
        line = self.service.log_text().strip()
        self.calls = self.control.calls()
        self.figures["fired"] += int(self.control[control.FIRED] > 0)
        if status is None:
            return "the service had to be killed"
        if status < 0:
            return f"the service died of signal {-status}: {line[-300:]}"
        if status != 0 and not line:
            return f"the service ended with {status} and without a line"
        if ended_itself:
            self.figures["refused_or_ended"] += 1
        problem = self.look(script, ended_itself)
        return problem and f"{problem}; the clients: {script.problems}; the log: {line[-600:]}"

    def look(self, script, ended_itself):
        if not self.service.start(patience=15):
            return f"the next start ended with {self.service.process.returncode}: {self.service.log_text()[-300:]}"
        with self.service.connect(10) as client:
            settled(client, 10)
        reader = self.service.reader()
        rows = [(client, number) for _, client, number in rows_after(reader, 0)]
        reader.close()
        self.service.stop()
        old = {(OLD, number) for number in range(FIRST, FIRST + OLD_MESSAGES)}
        # Where the service ended by itself, only what was settled is sure to be there.
        verdict = judge(rows, script.sides, old, time.monotonic() if ended_itself else None, patience=float("inf"))
        if not ended_itself:
            verdict = judge(rows, script.sides, old)
        for name in ("doubled", "committed_lost", "settled_lost", "late_lost"):
            keys = getattr(verdict, name)
            self.figures[name] += len(keys)
            if keys:
                return f"{name} {len(keys)} of {len(rows)} rows, the first {keys[:3]}"
        aside = [name for name in os.listdir(self.service.state) if ".damaged" in name]
        if aside:
            self.figures["set_aside"] += 1
            return f"a healthy store was set aside: {aside}"
        return None


def faults_of(sites, random):
    """All faults, by chance, but each kind of call in its turn: the rare ones matter as much as the frequent."""
    by_kind = {kind: [] for kind in control.KINDS}
    for (kind, site), count in sorted(sites.items()):
        by_kind[kind] += [(kind, site, ordinal, how) for ordinal in sorted({1, (count + 1) // 2, count})
                          for how in control.KINDS[kind]]
    turns = []
    for faults in by_kind.values():
        random.shuffle(faults)
        turns += enumerate(faults)
    return [fault for _, fault in sorted(turns, key=lambda turn: turn[0])]


def share_of(sites, part, parts):
    """By what a site is, which is the same in each run. Sites are odd."""
    return {(kind, site): count for (kind, site), count in sites.items() if site // 2 % parts == part}


def run(context, figures):
    figures.update(tried=0, of=0)
    old = old_store(context)
    workers = [Trials(context, old) for _ in range(SIDE_BY_SIDE)]
    sites = share_of(workers[0].learn(), *context.share())
    workers[0].figures.clear()
    faults = faults_of(sites, context.random)
    figures.update(of=len(faults), sites=len(sites), calls=sum(sites.values()))
    figures["uncalled"] = ",".join(kind for kind, count in workers[0].calls.items() if count == 0) or "none"
    waiting = deque(faults)
    with ThreadPoolExecutor(len(workers)) as pool:
        list(pool.map(lambda trials: trials.all_of(waiting), workers))
    figures.update({name: sum(trials.figures[name] for trials in workers) for name in COUNTED})
    if context.only:
        context.tell_part(context.only, figures)
