# SPDX-License-Identifier: Apache-2.0
"""Reads the fleet's messages with nothing of the programs that make them: zstd's library, and as much of Protocol
Buffers as fleet/format/batch.proto needs."""

import ctypes
import ctypes.util
import functools
import struct
from dataclasses import dataclass

HEAD = b"tnf\1"
MOST_BYTES = 900_000


@dataclass
class Batch:
    device: bytes
    first: int
    last: int
    left_out: int
    gaps: list  # (first, last)
    events: dict  # payloads by id


@functools.cache
def zstd_library():
    zstd = ctypes.CDLL(ctypes.util.find_library("zstd") or "libzstd.so.1")
    zstd.ZSTD_decompress.restype = zstd.ZSTD_compressBound.restype = ctypes.c_size_t
    zstd.ZSTD_decompress.argtypes = [ctypes.c_char_p, ctypes.c_size_t, ctypes.c_char_p, ctypes.c_size_t]
    zstd.ZSTD_isError.argtypes = [ctypes.c_size_t]
    return zstd


def unpacked(frame, plain=ctypes.create_string_buffer(MOST_BYTES)):
    size = zstd_library().ZSTD_decompress(plain, MOST_BYTES, frame, len(frame))
    if zstd_library().ZSTD_isError(size):
        raise ValueError("no zstd frame")
    return ctypes.string_at(plain, size)


def number_at(data, place):
    value, shift = 0, 0
    while True:
        byte = data[place]
        value |= (byte & 0x7F) << shift
        place, shift = place + 1, shift + 7
        if byte < 0x80:
            return value, place


def fields(data):
    """(field, value) of a message: an integer, a double's bytes or bytes."""
    place = 0
    while place < len(data):
        key, place = number_at(data, place)
        if key & 7 == 0:
            value, place = number_at(data, place)
        elif key & 7 == 1:
            value, place = struct.unpack_from("<d", data, place)[0], place + 8
        elif key & 7 == 2:
            size, place = number_at(data, place)
            value, place = data[place:place + size], place + size
        else:
            raise ValueError(f"wire type {key & 7}")
        yield key >> 3, value


def read(message):
    if message[:len(HEAD)] != HEAD:
        raise ValueError("not one of the fleet's messages")
    batch = Batch(b"", 0, 0, 0, [], {})
    events = []
    for field, value in fields(unpacked(message[len(HEAD):])):
        if field == 1:
            batch.device = value
        elif field == 3:
            batch.first = value
        elif field == 4:
            batch.last = value
        elif field == 5:
            batch.left_out = value
        elif field == 6:
            gap = dict(fields(value))
            batch.gaps.append((gap.get(1, 0), gap.get(2, 0)))
        elif field == 10:
            events.append(dict(fields(value)))
    for event in events:
        identity = batch.first + event.get(1, 0)
        if identity in batch.events:
            raise ValueError(f"event {identity} twice in a message")
        batch.events[identity] = event.get(5, b"")
    return batch
