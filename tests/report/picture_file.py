# SPDX-License-Identifier: Apache-2.0
"""Reads the colours of a PNG file, as far as browsers write them: 8 bits, RGB or RGBA, not interlaced."""

import collections
import struct
import zlib


def _lines(raw, stride, pixel):
    before = bytearray(stride)
    for at in range(0, len(raw), stride + 1):
        kind, line = raw[at], bytearray(raw[at + 1:at + 1 + stride])
        if kind == 1:
            for place in range(pixel, stride):
                line[place] = (line[place] + line[place - pixel]) & 255
        elif kind == 2:
            line = bytearray((here + above) & 255 for here, above in zip(line, before))
        elif kind == 3:
            for place in range(stride):
                left = line[place - pixel] if place >= pixel else 0
                line[place] = (line[place] + (left + before[place]) // 2) & 255
        elif kind == 4:
            for place in range(stride):
                left, corner = (line[place - pixel], before[place - pixel]) if place >= pixel else (0, 0)
                above = before[place]
                guess = left + above - corner
                near = min((abs(guess - left), 0), (abs(guess - above), 1), (abs(guess - corner), 2))[1]
                line[place] = (line[place] + (left, above, corner)[near]) & 255
        yield line
        before = line


def colours(path):
    """How many pixels have each colour, as #rrggbb; and the size."""
    with open(path, "rb") as file:
        data = file.read()
    if data[:8] != b"\x89PNG\r\n\x1a\n":
        raise ValueError(f"{path} is no PNG file")
    at, packed = 8, b""
    while at < len(data):
        size, kind = struct.unpack(">I4s", data[at:at + 8])
        chunk = data[at + 8:at + 8 + size]
        if kind == b"IHDR":
            width, height, depth, form, _, _, interlaced = struct.unpack(">IIBBBBB", chunk)
        elif kind == b"IDAT":
            packed += chunk
        at += size + 12
    if depth != 8 or form not in (2, 6) or interlaced:
        raise ValueError(f"{path}: depth {depth}, kind {form}")
    pixel = 3 if form == 2 else 4
    counts = collections.Counter()
    for line in _lines(zlib.decompress(packed), width * pixel, pixel):
        counts.update(zip(line[0::pixel], line[1::pixel], line[2::pixel]))
    return {f"#{red:02x}{green:02x}{blue:02x}": count for (red, green, blue), count in counts.items()}, (width, height)
