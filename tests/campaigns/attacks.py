# SPDX-License-Identifier: Apache-2.0
"""What hostile peers do: each attack is a function of the socket's path, random numbers, a size from 0 to 1 that scales
what it sets up, and what to call when it has begun. It goes on until its process is ended.
"""

import os
import struct
import time

import wire
from service import end_with_parent

REPORTER = 1 << 20
NOBODY = 65534
MESSAGE = {"hostile": 1, "text": "x" * 40}


def connect(path):
    return wire.Client(path, patience=60)


def for_ever(path, play):
    """Plays on one connection after the other: a hostile peer is cut off often."""
    while True:
        try:
            with connect(path) as client:
                while True:
                    play(client)
        except (wire.WireError, wire.Refused, OSError):
            time.sleep(0.001)


def make_sessions(client, count, start=True):
    for first in range(0, count, 500):
        numbers = []
        for reporter in range(REPORTER + first, REPORTER + min(first + 500, count)):
            numbers.append(client.send(wire.CREATE, reporter))
            if start:
                client.send(wire.START, reporter)
        for number in numbers:
            client.reply(number)


def flood(path, random, _, begun):
    """Messages as fast as they go, a thousand unanswered at any time."""
    client = connect(path)
    make_sessions(client, 1)
    begun()
    while True:
        numbers = []
        frames = []
        for _ in range(1000):
            client.number += 1
            numbers.append(client.number)
            frames.append(wire.request(client.number, wire.SEND, {**MESSAGE, "n": random.random()}, 4, 1, [REPORTER]))
        client.send_bytes(b"".join(frames))
        for number in numbers:
            client.reply(number)


def random_frames(path, random, _, begun):
    """Frames of random bytes, announced rightly or wrongly."""
    begun()

    def play(client):
        body = random.randbytes(random.randrange(1, 2000))
        client.send_bytes(wire.frame(body) if random.random() < 0.7 else random.randbytes(4) + body)

    for_ever(path, play)


def wrong_requests(path, random, _, begun):
    """Readable requests with wrong operations, counts, kinds and values."""
    begun()
    values = (None, True, -1, 1 << 63, 1.5, "text", b"bytes", [], [1, "two"], {}, {"a": None}, {"b": [{"c": b""}]})

    def play(client):
        words = [random.choice(values) for _ in range(random.randrange(5))]
        # All but the one that ends the service, which anybody may ask for.
        number = client.send(random.choice((*range(wire.KILL), 99, 100, 1 << 40)), *words)
        if random.random() < 0.2:
            client.reply(number, patience=0.05)

    for_ever(path, lambda client: guarded(play, client))


def guarded(play, client):
    try:
        play(client)
    except wire.Refused:
        pass  # that is what it asked for


def random_sessions(path, random, _, begun):
    """Right requests in any order over a few sessions."""
    begun()

    def play(client):
        reporter = REPORTER + random.randrange(20)
        words = random.choice(((wire.CREATE, reporter), (wire.RETYPE, random.randrange(14), reporter),
                               (wire.CONFIGURE, MESSAGE, reporter), (wire.START, reporter), (wire.STOP, reporter),
                               (wire.DESTROY, reporter), (wire.SEND, MESSAGE, 4, 1, [reporter]),
                               (wire.SEND, MESSAGE, 14, 0, None), (wire.ALL_REPORTERS,), (wire.STATUS,)))
        number = client.send(*words)
        if words[0] != wire.START:
            client.reply(number)

    for_ever(path, lambda client: guarded(play, client))


def never_reading(path, _, __, begun):
    """Asks for the status again and again and reads nothing."""
    begun()
    frames = b"".join(wire.request(number, wire.STATUS) for number in range(1, 200))
    for_ever(path, lambda client: client.send_bytes(frames))


def connect_storm(path, _, __, begun):
    """Comes and goes."""
    begun()
    while True:
        try:
            connect(path).close()
        except OSError:
            time.sleep(0.001)


def half_frames(path, _, size, begun):
    """Connections that each send most of a large frame and no more."""
    clients = []
    for _ in range(int(20 + 180 * size)):
        client = connect(path)
        client.socket.setblocking(False)
        clients.append((client, memoryview(struct.pack("<I", 1 << 20) + bytes(900_000))))
    begun()
    while True:
        clients = [(client, push(client, rest)) for client, rest in clients]
        time.sleep(0.01)


def push(client, rest):
    try:
        return rest[client.socket.send(rest):] if rest else rest
    except BlockingIOError:
        return rest
    except OSError:
        return rest[:0]


def listings(path, _, size, begun):
    """4,000 times the list of 100,000 sessions, which are two connections' since one may not have so many. Who asks is
    cut off when it doesn't read fast enough, and comes again."""
    holders = [connect(path) for _ in range(2)]
    for holder in holders:
        make_sessions(holder, int(1000 + 49_000 * size), start=False)
    begun()

    def play(client):
        first = client.number + 1
        client.number += int(100 + 3900 * size)
        client.send_bytes(b"".join(wire.request(n, wire.ALL_REPORTERS) for n in range(first, client.number + 1)))
        read_and_forget(client, client.number)

    for_ever(path, play)


def read_and_forget(client, last):
    """Reads replies until that one without looking into them."""
    end = wire.encode(last)
    while True:
        bodies, client.pending = wire.split(client.pending + client.receive_bytes(time.monotonic() + 60))
        if any(body[1:1 + len(end)] == end for body in bodies):
            return


def million_named(path, _, size, begun):
    """One message to one session, named a million times."""
    count = int(20_000 + 980_000 * size)
    reporter = 5
    with connect(path) as client:
        client.call(wire.CREATE, reporter)
        client.send(wire.START, reporter)
        begun()
        while True:
            guarded(lambda one: one.call(wire.SEND, {"m": 1}, 4, 1, [reporter] * count), client)


def broadcast(path, _, size, begun):
    """Messages to everybody, with a thousand sessions running."""
    client = connect(path)
    make_sessions(client, int(100 + 900 * size))
    begun()
    while True:
        numbers = [client.send(wire.SEND, {**MESSAGE, "n": client.number}, 4, 1, None) for _ in range(20)]
        for number in numbers:
            client.reply(number)


def idle(path, _, size, begun):
    """A thousand connections that say nothing."""
    clients = [connect(path) for _ in range(int(100 + 900 * size))]
    begun()
    while clients:
        time.sleep(1)


ATTACKS = (flood, random_frames, wrong_requests, random_sessions, never_reading, connect_storm, half_frames, listings,
           million_named, broadcast, idle)
# How many processes attack at once where one is not much.
PROCESSES = {flood: 2, connect_storm: 2}


def attack(function, path, random, size, begun):
    """The body of an attacking process; another user than the polite client's where it may become one."""
    if os.geteuid() == 0:
        os.setgid(NOBODY)
        os.setuid(NOBODY)
    end_with_parent()
    try:
        function(path, random, size, begun)
    except (wire.WireError, wire.Refused, OSError) as problem:
        begun()  # for whoever waits; what ended it is the campaign's to tell
        raise SystemExit(f"{function.__name__}: {problem}") from None
