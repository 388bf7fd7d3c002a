# SPDX-License-Identifier: Apache-2.0
"""Numbered messages: sent under load, and looked for in the store one by one afterwards."""

import struct
import threading
import time
from collections import Counter
from dataclasses import dataclass, field

import wire

# From here on every number has the same length on the wire, so that a message is made by putting two numbers into it.
FIRST = 65536
FIRST_SETTLE = 256
# A message leaves an event of the kit, one of its service and one of the mirrored session: all are recorded, the first
# is looked at.
ROWS = ("SELECT id, json_extract(payload, '$.campaign_client'), json_extract(payload, '$.campaign_number') FROM events"
        " WHERE id > ? AND backend = 'tally' AND name LIKE 'sys.oxbow.tarnkit.%'"
        " AND json_type(payload, '$.campaign_number') = 'integer' ORDER BY id")


def message(client, number):
    return {"campaign_client": client, "campaign_number": number}


def message_parts(client):
    """The frame of a numbered message, cut where its number stands: as the request's and in the dictionary."""
    whole = wire.request(0x01020304, wire.SEND, {"campaign_client": client, "campaign_number": 0x01020304},
                         wire.PLAYBACK, wire.PLAYBACK_START, [client])
    return whole.split(bytes((1, 2, 3, 4)))


def begin_session(client, reporter):
    client.call(wire.CREATE, reporter)
    client.call(wire.CONFIGURE, {"HostApplicationDisplayID": "org.example.campaign"}, reporter)
    client.send(wire.START, reporter)


def rows_after(reader, row):
    """[(id, client, number)] of the numbered messages in the store after that row."""
    return reader.execute(ROWS, (row,)).fetchall()


class Sender(threading.Thread):
    """A client that sends as fast as the service lets it, until it is told to stop or the service goes away. `answers`
    holds when which numbers were answered, `settled` up to which number all is known to be committed."""

    def __init__(self, path, key, window=512, batch=64, settle_seconds=0.02):
        super().__init__(daemon=True)
        self.path, self.key, self.window, self.batch = path, key, window, batch
        self.settle_seconds = settle_seconds
        self.stopping = threading.Event()
        self.parts = message_parts(key)
        self.next = FIRST
        self.outstanding = 0
        self.answers = []
        self.refused = set()
        self.settled = FIRST - 1
        self.settles = {}
        self.can_settle = True
        self.problem = None

    def run(self):
        try:
            with wire.Client(self.path) as client:
                begin_session(client, self.key)
                client.settle()
                self.load(client)
        except (wire.WireError, wire.Refused, OSError) as problem:
            self.problem = problem

    def load(self, client):
        due = time.monotonic()
        while not self.stopping.is_set() or self.outstanding:
            if not self.stopping.is_set() and self.outstanding <= self.window - self.batch:
                self.send_batch(client)
            if self.can_settle and time.monotonic() >= due:
                due = time.monotonic() + self.settle_seconds
                self.ask_to_settle(client)
            if self.outstanding:
                self.take_replies(client)

    def send_batch(self, client):
        numbers = [struct.pack(">I", number) for number in range(self.next, self.next + self.batch)]
        self.next += self.batch
        self.outstanding += self.batch
        client.send_bytes(b"".join(number.join(self.parts) for number in numbers))

    def ask_to_settle(self, client):
        number = FIRST_SETTLE + len(self.settles)
        self.can_settle = number < FIRST
        self.settles[number] = self.next - 1
        self.outstanding += 1
        client.send_bytes(wire.request(number, wire.SETTLE))

    def take_replies(self, client):
        data = client.receive_bytes(time.monotonic() + client.patience)
        now = time.monotonic()
        bodies, client.pending = wire.split(client.pending + data)
        answered = []
        for body in bodies:
            reply = wire.decode(body)
            number = reply[0]
            if number in self.settles:
                self.settle_answered(number, reply[1])
            elif number >= FIRST and reply[1] is None:
                answered.append(number)
            elif number >= FIRST:
                self.refused.add(number)
            else:
                continue  # the start's, which comes at the stop
            self.outstanding -= 1
        self.answers.append((now, answered))

    def settle_answered(self, number, error):
        if error is None:
            self.settled = max(self.settled, self.settles[number])
        else:
            self.can_settle = False

    def answered(self):
        return [number for _, numbers in self.answers for number in numbers]


class Watcher(threading.Thread):
    """Reads along, as anybody may: what it has seen is committed."""

    def __init__(self, service, after=0):
        super().__init__(daemon=True)
        self.service, self.row = service, after
        self.stopping = threading.Event()
        self.seen = set()

    def run(self):
        reader = self.service.reader()
        try:
            while not self.stopping.wait(0.01):
                for row, client, number in rows_after(reader, self.row):
                    self.row = row
                    self.seen.add((client, number))
        except reader.Error:
            pass  # the file can't be read in this moment; what was seen counts
        finally:
            reader.close()

    def end(self):
        self.stopping.set()
        self.join()


@dataclass
class Verdict:
    answered: int = 0
    rows: int = 0
    doubled: list = field(default_factory=list)
    committed_lost: list = field(default_factory=list)
    settled_lost: list = field(default_factory=list)
    late_lost: list = field(default_factory=list)
    lost: int = 0
    oldest_lost_ms: float = 0.0
    invented: list = field(default_factory=list)


def judge(rows, senders, seen=(), ended=None, patience=0.2):
    """What became of the senders' messages. `rows`: (client, number) of the store; `seen`: those that somebody read
    before; `ended`: when the service was killed. Without it every answered message counts as late when it isn't there.
    """
    counts = Counter(rows)
    verdict = Verdict(rows=len(rows))
    verdict.doubled = sorted(key for key, count in counts.items() if count > 1)
    verdict.committed_lost = sorted(key for key in seen if key not in counts)
    for sender in senders:
        verdict.settled_lost += [(sender.key, number) for number in range(FIRST, sender.settled + 1)
                                 if (sender.key, number) not in counts and number not in sender.refused]
        for when, numbers in sender.answers:
            verdict.answered += len(numbers)
            lost = [(sender.key, number) for number in numbers if (sender.key, number) not in counts]
            verdict.lost += len(lost)
            age = ended - when if ended is not None else patience + 1
            if lost and ended is not None:
                verdict.oldest_lost_ms = max(verdict.oldest_lost_ms, age * 1000)
            if age > patience:
                verdict.late_lost += lost
    sent = {sender.key: sender.next for sender in senders}
    verdict.invented = sorted(key for key in counts if key[0] in sent and not FIRST <= key[1] < sent[key[0]])
    return verdict
