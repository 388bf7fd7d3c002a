# SPDX-License-Identifier: Apache-2.0
"""Plays each example of dictionary/messages.toml against a service of its own and compares what the recorder has then
with what the table shows: the events of the names that it shows (and of the details, where it shows them), all of them,
in order and member by member.

usage: play_examples.py [--show] TARNREPORTINGD TARNREPORTINGCTL MESSAGES_TOML
--show prints what came in place of comparing it.

A text of the table stands for what differs from run to run: <now> a moment of the playing in epoch seconds, <number> a
number from 0 on, <text> a text that isn't empty, <any> anything. The backend "file" is the session's summary file.
"""

import json
import os
import shlex
import signal
import subprocess
import sys
import tempfile
import time
import tomllib

SECONDS = 20
STOP = "stopReportingSessionForID"


class Failure(Exception):
    pass


class Service:
    """A service with a private directory, and tarnreportingctl against it."""

    def __init__(self, daemon, ctl, folder):
        self.daemon, self.folder = daemon, folder
        self.state = os.path.join(folder, "state")
        socket = os.path.join(folder, "socket")
        self.ctl = [ctl, "--socket", socket, "--state-dir", self.state]
        self.arguments = ["--socket", socket, "--state-dir", self.state, "--log-level", "error"]
        self.process = None

    def __enter__(self):
        self.process = subprocess.Popen([self.daemon, *self.arguments], stdin=subprocess.DEVNULL)
        deadline = time.monotonic() + SECONDS
        while self.call("status", allowed=(0, 69))[0] != 0:
            if time.monotonic() > deadline or self.process.poll() is not None:
                raise Failure("the service doesn't come up")
            time.sleep(0.02)
        return self

    def __exit__(self, *_):
        if self.process.poll() is None:
            self.process.kill()
            self.process.wait()

    def end(self):
        """Ends the service in order, so that everything is committed."""
        self.process.send_signal(signal.SIGTERM)
        if self.process.wait(SECONDS) != 0:
            raise Failure(f"the service ended with status {self.process.returncode}")

    def call(self, *words, allowed=(0,)):
        done = subprocess.run([*self.ctl, *words], stdin=subprocess.DEVNULL, capture_output=True, text=True,
                              timeout=SECONDS)
        if done.returncode not in allowed:
            raise Failure(f"{' '.join(words)}: {done.stderr.strip()}")
        return done.returncode, done.stdout

    def write_channels(self, text):
        folder = os.path.join(self.state, "flume")
        os.makedirs(folder, exist_ok=True)
        with open(os.path.join(self.folder, "channels"), "w", encoding="utf-8") as file:
            file.write(text)
        os.replace(os.path.join(self.folder, "channels"), os.path.join(folder, "example.json"))


def play_script(service, lines, channels):
    """Feeds the script line by line; before a stop the drivers go on to the next of their channel files."""
    player = subprocess.Popen([*service.ctl, "run"], stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)
    later = iter(channels[1:])
    for line in lines:
        operation = json.loads(line)["op"]
        if operation == STOP and (text := next(later, None)):
            service.write_channels(text)
        player.stdin.write(line + "\n")
        player.stdin.flush()
        # A start's reply comes with the stop; every other one tells that the line was served.
        while operation not in ("startReportingSessionForID", "sleep"):
            reply = json.loads(player.stdout.readline() or '{"op": null}')
            if reply["op"] is None or reply["error"] is not None:
                player.kill()
                raise Failure(f"{line}\n  answered {reply}")
            if reply["op"] == operation:
                break
    player.stdin.close()
    player.stdout.read()
    if player.wait(SECONDS) != 0:
        raise Failure(f"tarnreportingctl run ended with status {player.returncode}")


def events_of(service):
    events = [json.loads(line) for line in service.call("events", "--json")[1].splitlines()]
    folder = os.path.join(service.state, "DiagnosticLogs", "Audio", "Reporting")
    for name in sorted(os.listdir(folder)) if os.path.isdir(folder) else ():
        with open(os.path.join(folder, name), encoding="utf-8") as file:
            for message in json.load(file):
                events += [{"backend": "file", "name": name, "payload": payload} for name, payload in message.items()]
    return events


def is_of_kind(event, shown):
    return all(event.get(member) == shown[member] for member in ("backend", "name", "detail") if member in shown)


def matches(shown, found, playing):
    if shown == "<any>":
        return True
    if shown in ("<now>", "<number>"):
        least, most = playing if shown == "<now>" else (0, float("inf"))
        return isinstance(found, (int, float)) and not isinstance(found, bool) and least <= found <= most
    if shown == "<text>":
        return isinstance(found, str) and bool(found)
    if isinstance(shown, dict) and isinstance(found, dict):
        return shown.keys() == found.keys() and all(matches(shown[key], found[key], playing) for key in shown)
    return isinstance(shown, bool) == isinstance(found, bool) and shown == found


def play(example, daemon, ctl, show):
    channels = example.get("channels", [])
    with tempfile.TemporaryDirectory(prefix="tarnwords") as folder:
        service = Service(daemon, ctl, folder)
        for call in example.get("before", []):
            service.call(*shlex.split(call))
        if channels:
            service.write_channels(channels[0])
        began = time.time() - 1
        with service:
            play_script(service, example["script"].strip().splitlines(), channels)
            service.end()
        playing = (began, time.time() + 1)
        events = events_of(service)
    if show:
        print(*(json.dumps(event) for event in events), sep="\n")
        return
    shown = [json.loads(line) for line in example["recorded"].strip().splitlines()]
    if not shown:
        raise Failure("the example shows nothing that is recorded")
    found = [event for event in events if any(is_of_kind(event, wanted) for wanted in shown)]
    if len(found) != len(shown):
        raise Failure(f"{len(shown)} events are shown, {len(found)} came:\n" + "\n".join(map(json.dumps, found)))
    for wanted, came in zip(shown, found):
        if any(not matches(wanted[member], came.get(member), playing) for member in wanted):
            raise Failure(f"shown {json.dumps(wanted)}\n  came  {json.dumps(came)}")


def main(show, daemon, ctl, table):
    with open(table, "rb") as file:
        derived = tomllib.load(file)["derived"]
    if not derived:
        raise SystemExit("the table has no examples")
    failed = 0
    for entry in derived:
        name = entry.get("event") or f"{entry['category']} {entry['type']}"
        try:
            play(entry["example"], daemon, ctl, show)
        except Failure as failure:
            failed += 1
            print(f"{name}: {failure}", file=sys.stderr)
    if failed:
        raise SystemExit(f"{failed} of {len(derived)} examples don't do what they show")
    print(f"{len(derived)} examples do what they show")


if __name__ == "__main__":
    words = [word for word in sys.argv[1:] if word != "--show"]
    if len(words) != 3:
        raise SystemExit(__doc__)
    main("--show" in sys.argv, *words)
