# SPDX-License-Identifier: Apache-2.0
"""Plays the conversation of docs/wire.md against the real service: what it shows as sent is sent, and what it shows as
received must come, byte for byte.

usage: wire_conversation.py TARNREPORTINGD WIRE_MD
"""

import os
import re
import signal
import socket
import subprocess
import sys
import tempfile
import time

SECONDS = 20
HEX = re.compile(r"^(?:[0-9a-f]{2}[ ]*)+")


def conversation(document):
    """(direction, bytes) for each shown frame; a line without a direction carries on the frame above it."""
    section = document.split("## A conversation in hex", 1)[1].split("A client in a dozen lines", 1)[0]
    frames = []
    for line in section.splitlines():
        body = line.strip()
        direction = body[:1] if body[:1] in "<>" else ""
        shown = HEX.match(body[len(direction):].lstrip() + " ")
        if not line.startswith("    ") or not body or not shown:
            continue
        if direction:
            frames.append([direction, bytes.fromhex(shown.group(0))])
        else:
            frames[-1][1] += bytes.fromhex(shown.group(0))
    return frames


def connect(path, service):
    deadline = time.monotonic() + SECONDS
    while time.monotonic() < deadline and service.poll() is None:
        connection = socket.socket(socket.AF_UNIX)
        connection.settimeout(SECONDS)
        try:
            connection.connect(path)
            return connection
        except OSError:
            connection.close()
            time.sleep(0.02)
    raise SystemExit("the service doesn't listen")


def receive(connection, count):
    received = b""
    while len(received) < count:
        part = connection.recv(count - len(received))
        if not part:
            raise SystemExit(f"the connection ended after {received.hex(' ')}")
        received += part
    return received


def play(frames, connection):
    for place, (direction, frame) in enumerate(frames):
        if int.from_bytes(frame[:4], "little") != len(frame) - 4:
            raise SystemExit(f"the length of frame {place + 1} is wrong in the document: {frame.hex(' ')}")
        if direction == ">":
            connection.sendall(frame)
            continue
        received = receive(connection, len(frame))
        if received != frame:
            raise SystemExit(f"frame {place + 1}: shown {frame.hex(' ')}\n          came {received.hex(' ')}")


def main(program, document):
    with open(document, encoding="utf-8") as file:
        frames = conversation(file.read())
    sent, shown = (sum(direction == wanted for direction, _ in frames) for wanted in "><")
    if sent < 8 or shown < 7:
        raise SystemExit(f"found only {sent} frames to send and {shown} to receive")
    with tempfile.TemporaryDirectory(prefix="tarnwire") as folder:
        path = os.path.join(folder, "socket")
        service = subprocess.Popen([program, "--socket", path, "--state-dir", os.path.join(folder, "state"),
                                    "--log-level", "error"], stdin=subprocess.DEVNULL)
        try:
            with connect(path, service) as connection:
                play(frames, connection)
            service.send_signal(signal.SIGTERM)
            if service.wait(SECONDS) != 0:
                raise SystemExit(f"the service ended with status {service.returncode}")
        finally:
            if service.poll() is None:
                service.kill()
                service.wait()
    print(f"{sent} frames sent, {shown} came as shown")


if __name__ == "__main__":
    if len(sys.argv) != 3:
        raise SystemExit(__doc__)
    main(*sys.argv[1:])
