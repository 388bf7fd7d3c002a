# SPDX-License-Identifier: Apache-2.0
"""A client of the service in bytes: the CBOR of property lists, frames, and a connection that waits for its replies.

It shares no code with the programs, so that a fault of theirs isn't its own as well.
"""

import socket
import struct
import time
from dataclasses import dataclass

CREATE, RETYPE, TYPE_OF, CONFIGURE, START, SEND, STOP, DESTROY, REPORTER, ALL_REPORTERS, KILL = range(1, 12)
STATUS, SETTLE = 100, 101
UNKNOWN_OPERATION = 1
PLAYBACK, PLAYBACK_START = 4, 1


class WireError(Exception):
    """Bytes that are no value or no frame, a connection that ended, or a reply that didn't come in time."""


class Refused(Exception):
    """The service answered with an error."""

    def __init__(self, error):
        super().__init__(f"{error[0]} {error[1]}: {error[2]}")
        self.domain, self.code, self.text = error


@dataclass(frozen=True)
class Date:
    seconds: float


def head(major, number):
    for size, kind in ((1, 24), (2, 25), (4, 26), (8, 27)):
        if number < 24:
            return bytes([major << 5 | number])
        if number < 1 << 8 * size:
            return bytes([major << 5 | kind]) + number.to_bytes(size, "big")
    raise WireError(f"{number} has more than 64 bits")


def encode(value):
    if value is None or isinstance(value, bool):
        return {None: b"\xf6", False: b"\xf4", True: b"\xf5"}[value]
    if isinstance(value, int):
        return head(0, value) if value >= 0 else head(1, -1 - value)
    if isinstance(value, float):
        return b"\xfb" + struct.pack(">d", value)
    if isinstance(value, str):
        text = value.encode()
        return head(3, len(text)) + text
    if isinstance(value, bytes):
        return head(2, len(value)) + value
    if isinstance(value, (list, tuple)):
        return head(4, len(value)) + b"".join(map(encode, value))
    if isinstance(value, dict):
        return head(5, len(value)) + b"".join(encode(key) + encode(item) for key, item in value.items())
    if isinstance(value, Date):
        return head(6, 1) + encode(value.seconds)
    raise WireError(f"no property list holds {value!r}")


class Decoder:
    """Reads one value after the other from bytes."""

    FLOATS = {25: ">e", 26: ">f", 27: ">d"}
    SIMPLE = {20: False, 21: True, 22: None}

    def __init__(self, data):
        self.data, self.at = data, 0

    def take(self, count):
        if self.at + count > len(self.data):
            raise WireError("the value is cut off")
        self.at += count
        return self.data[self.at - count:self.at]

    def number(self, low):
        if low < 24:
            return low
        if low > 27:
            raise WireError(f"an indefinite or reserved length ({low})")
        return int.from_bytes(self.take(1 << low - 24), "big")

    def value(self):
        first = self.take(1)[0]
        major, low = first >> 5, first & 31
        if major == 7:
            return self.simple(low)
        number = self.number(low)
        if major < 2:
            return -1 - number if major else number
        if major < 4:
            data = bytes(self.take(number))
            return data if major == 2 else data.decode()
        if major == 4:
            return [self.value() for _ in range(number)]
        if major == 5:
            return {self.value(): self.value() for _ in range(number)}
        if number != 1:
            raise WireError(f"tag {number}")
        return Date(self.value())

    def simple(self, low):
        if low in self.FLOATS:
            layout = self.FLOATS[low]
            return struct.unpack(layout, self.take(struct.calcsize(layout)))[0]
        if low not in self.SIMPLE:
            raise WireError(f"simple value {low}")
        return self.SIMPLE[low]


def decode(data):
    decoder = Decoder(data)
    value = decoder.value()
    if decoder.at != len(data):
        raise WireError(f"{len(data) - decoder.at} bytes after the value")
    return value


def frame(body):
    return struct.pack("<I", len(body)) + body


def request(number, operation, *arguments):
    return frame(encode([number, operation, *arguments]))


def split(data):
    """(bodies of the whole frames at the beginning, what is left)."""
    bodies, at = [], 0
    while len(data) - at >= 4:
        (length,) = struct.unpack_from("<I", data, at)
        if len(data) - at - 4 < length:
            break
        bodies.append(data[at + 4:at + 4 + length])
        at += 4 + length
    return bodies, data[at:]


class Client:
    """One connection. Not for several threads at once."""

    def __init__(self, path, patience=30.0):
        self.patience = patience
        self.socket = socket.socket(socket.AF_UNIX)
        self.socket.settimeout(patience)
        try:
            self.socket.connect(path)
        except OSError:
            self.socket.close()
            raise
        self.number = 0
        self.pending = b""
        self.replies = {}

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.close()

    def close(self):
        self.socket.close()

    def send(self, operation, *arguments):
        self.number += 1
        self.send_bytes(request(self.number, operation, *arguments))
        return self.number

    def send_bytes(self, data):
        try:
            self.socket.sendall(data)
        except OSError as error:
            raise WireError(f"can't send: {error}") from error

    def receive_bytes(self, deadline):
        left = deadline - time.monotonic()
        if left <= 0:
            raise WireError("no reply in time")
        self.socket.settimeout(left)
        try:
            data = self.socket.recv(1 << 20)
        except TimeoutError as error:
            raise WireError("no reply in time") from error
        except OSError as error:
            raise WireError(f"can't receive: {error}") from error
        finally:
            self.socket.settimeout(self.patience)
        if not data:
            raise WireError("the service ended the connection")
        return data

    def reply(self, number, patience=None):
        """The results of the reply to that request; other replies that come first are kept."""
        deadline = time.monotonic() + (self.patience if patience is None else patience)
        while number not in self.replies:
            bodies, self.pending = split(self.pending + self.receive_bytes(deadline))
            for body in bodies:
                reply = decode(body)
                self.replies[reply[0]] = reply[1:]
        error, *results = self.replies.pop(number)
        if error is not None:
            raise Refused(error)
        return results[0] if results else None

    def call(self, operation, *arguments, patience=None):
        return self.reply(self.send(operation, *arguments), patience)

    def settle(self):
        """Whether all that this connection sent is committed now; False where the service doesn't know the operation
        yet, and then nothing is known."""
        try:
            self.call(SETTLE)
        except Refused as refusal:
            if refusal.code != UNKNOWN_OPERATION:
                raise
            return False
        return True
