# SPDX-License-Identifier: Apache-2.0
"""A PipeWire of the test's own on a private directory, the service, and the adapter between them."""

import glob
import json
import os
import shutil
import signal
import sqlite3
import subprocess
import tempfile
import time
import unittest
import wave

HERE = os.path.dirname(os.path.abspath(__file__))
CONF = os.path.join(HERE, "conf")
PATIENCE = 60
# By how much a time may be off, in seconds, beside what the programs waited for a processor.
TOLERANCE = 0.1
METADATA = "{ factory = metadata args = { metadata.name = default } }"
STEREO = ("{ direction: %s, mode: dsp, format: { mediaType: audio, mediaSubtype: raw, format: F32P, rate: 48000, "
          "channels: 2, position: [FL, FR] } }")


def eventually(holds, patience=PATIENCE):
    """What came to hold in time, or the last answer."""
    deadline = time.monotonic() + patience
    while True:
        answer = holds()
        if answer or time.monotonic() > deadline:
            return answer
        time.sleep(0.02)


def need(holds, text=""):
    """What the rest stands on."""
    if not holds:
        raise AssertionError(text)


class Streamer:
    """The tests' own stream, and what it saw of itself, by the clock that messages are stamped with."""

    def __init__(self, process):
        self.process = process
        self.seen = {}

    def saw(self, word):
        """Its time or duration, once it has said so."""
        while word not in self.seen:
            line = self.process.stdout.readline()
            need(line, f"the stream ended and never said {word}")
            said, number = line.split()
            self.seen[said] = float(number)
        return self.seen[word]


class Machine:
    """All of it in a folder. `managed`: a session manager links streams."""

    def __init__(self, managed, programs):
        self.managed = managed
        self.daemon, self.control, self.program = programs
        self.folder = tempfile.mkdtemp(prefix="tarnpw")
        self.socket = os.path.join(self.folder, "socket")
        self.state = os.path.join(self.folder, "state")
        shutil.copytree(CONF, os.path.join(self.folder, "conf"))
        with open(os.path.join(CONF, "pipewire.conf.in"), encoding="utf-8") as given:
            text = given.read().replace("@METADATA@", "" if self.managed else METADATA)
        self.write("conf/pipewire.conf", text)
        self.environment = {**os.environ, "XDG_RUNTIME_DIR": self.folder, "PIPEWIRE_RUNTIME_DIR": self.folder,
                            "XDG_CONFIG_HOME": self.folder, "XDG_STATE_HOME": self.folder, "HOME": self.folder,
                            "WIREPLUMBER_CONFIG_DIR": os.path.join(self.folder, "conf", "wireplumber"),
                            "DBUS_SESSION_BUS_ADDRESS": "disabled:", "PIPEWIRE_DEBUG": "1"}
        for name in ("PIPEWIRE_REMOTE", "TARNREPORTING_SOCKET"):
            self.environment.pop(name, None)
        self.running = []
        self.before = 0
        self.waits = {}  # of each thread, in nanoseconds
        self.log = open(os.path.join(self.folder, "adapter.log"), "ab")

    # Programs

    def write(self, name, text):
        path = os.path.join(self.folder, name)
        with open(path, "w", encoding="utf-8") as file:
            file.write(text)
        return path

    def spawn(self, *words, **options):
        process = subprocess.Popen(words, stdin=subprocess.DEVNULL, env=self.environment, **options)
        self.running.append(process)
        return process

    def end(self, process, how=signal.SIGKILL):
        if process.poll() is None:
            process.send_signal(how)
        process.wait(PATIENCE)
        if process in self.running:
            self.running.remove(process)

    def close(self):
        for process in reversed(list(self.running)):
            self.end(process)
        self.log.close()
        shutil.rmtree(self.folder, ignore_errors=True)

    def tool(self, *words):
        return subprocess.run(words, stdin=subprocess.DEVNULL, env=self.environment, capture_output=True, text=True,
                              timeout=PATIENCE)

    def start_pipewire(self):
        quiet = {"stdout": subprocess.DEVNULL, "stderr": subprocess.DEVNULL}
        self.pipewire = self.spawn("pipewire", "-c", os.path.join(self.folder, "conf", "pipewire.conf"), **quiet)
        need(eventually(lambda: self.node("microphone")), "PipeWire doesn't come up")
        if self.managed:
            self.manager = self.spawn("wireplumber", **quiet)
            need(eventually(lambda: self.default_sink() == "speaker"), "WirePlumber doesn't come up")

    def start_service(self, *words):
        self.service = self.spawn(self.daemon, "--socket", self.socket, "--state-dir", self.state,
                                  "--log-level", "error", *words)
        need(eventually(lambda: os.path.exists(self.socket) and self.ctl("status").returncode == 0))

    def start_adapter(self, *words):
        self.adapter = self.spawn(self.program, "--socket", self.socket, "--log-level", "debug", *words,
                                  stdout=self.log, stderr=self.log)

    def start(self, *words):
        """All of it; the adapter looks at PipeWire and is connected to the service."""
        self.start_service()
        self.start_pipewire()
        self.start_adapter(*words)
        need(eventually(lambda: "looking at PipeWire" in self.adapter_log()), self.adapter_log())
        self.mark()

    def ctl(self, *words):
        return self.tool(self.control, "--socket", self.socket, "--state-dir", self.state, *words)

    def adapter_log(self):
        with open(os.path.join(self.folder, "adapter.log"), encoding="utf-8") as file:
            return file.read()

    def waited(self):
        """How long threads of PipeWire, its session manager, the adapter and the programs that ended meanwhile waited
        for a processor while they had something to do, in seconds."""
        for process in (self.pipewire, self.adapter, *([self.manager] if self.managed else [])):
            self.look_at_waits(process)
        return sum(self.waits.values()) / 1e9

    def look_at_waits(self, process):
        for path in glob.glob(f"/proc/{process.pid}/task/*/schedstat"):
            try:
                with open(path, encoding="utf-8") as file:
                    self.waits[path] = int(file.read().split()[1])
            except (FileNotFoundError, ProcessLookupError):
                pass  # it has just ended

    def mark(self):
        """From here on times are looked at."""
        self.before = self.waited()

    def tolerance(self):
        """By how much times may be off that were taken since the mark: on a busy machine events are sent and read
        late."""
        return TOLERANCE + self.waited() - self.before

    # PipeWire

    def dump(self):
        answer = self.tool("pw-dump")
        try:
            return json.loads(answer.stdout)
        except ValueError:
            return []

    def node(self, name):
        """The object of the node of this name, or nothing."""
        for thing in self.dump():
            if thing["type"].endswith(":Node") and thing["info"]["props"].get("node.name") == name:
                return thing
        return None

    def default_sink(self):
        for thing in self.dump():
            if thing["type"].endswith(":Metadata") and thing["props"].get("metadata.name") == "default":
                for entry in thing["metadata"]:
                    if entry["key"] == "default.audio.sink":
                        return entry["value"]["name"]
        return None

    def runs(self, name):
        node = self.node(name)
        return node if node and node["info"]["state"] == "running" else None

    def set_props(self, name, props):
        self.tool("pw-cli", "s", str(self.node(name)["id"]), "Props", props)

    def wav(self, seconds, rate=48000):
        path = os.path.join(self.folder, f"{seconds}-{rate}.wav")
        if not os.path.exists(path):
            with wave.open(path, "wb") as file:
                file.setnchannels(2)
                file.setsampwidth(2)
                file.setframerate(rate)
                file.writeframes(b"\0\1\0\1" * int(seconds * rate))
        return path

    def play(self, name, seconds, *words, role="Music"):
        """pw-play as a node and an application of its own, linked to the speaker where nobody does that."""
        process = self.spawn("pw-play", "--media-role", role, "-P",
                             '{ node.name = "%s" application.id = "org.test.%s" }' % (name, name), *words,
                             self.wav(seconds), stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        if not self.managed:
            self.link(name, "speaker")
        return process

    def link(self, name, sink):
        node = eventually(lambda: self.node(name))
        need(node, name)
        if not self.tool("pw-link", "-o").stdout.count(name + ":output_"):
            self.tool("pw-cli", "s", str(node["id"]), "PortConfig", STEREO % "Output")
        need(eventually(lambda: name + ":output_FR" in self.tool("pw-link", "-o").stdout))
        for channel in ("FL", "FR"):
            answer = self.tool("pw-link", f"{name}:output_{channel}", f"{sink}:playback_{channel}")
            need(answer.returncode == 0, answer.stderr)

    def finish(self, *processes):
        for process in processes:
            process = getattr(process, "process", process)
            until = time.monotonic() + PATIENCE
            while process.poll() is None and time.monotonic() < until:
                self.look_at_waits(process)
                time.sleep(0.02)
            process.wait(0)
            self.running.remove(process)

    # What is recorded

    def rows(self, query, *values):
        [path] = [os.path.join(self.state, name) for name in os.listdir(self.state) if name == "recorder.sqlite3"]
        database = sqlite3.connect(f"file:{path}?mode=ro", uri=True, timeout=PATIENCE)
        try:
            database.row_factory = sqlite3.Row
            return database.execute(query, values).fetchall()
        finally:
            database.close()

    def sessions(self, name=None):
        """Of the application org.test.NAME, or of all."""
        return self.rows("SELECT * FROM sessions WHERE application LIKE ? ORDER BY id",
                         "org.test." + name if name else "org.test.%")

    def ended(self, name, count=1):
        """The sessions of the application, once so many are there and none is open."""
        found = eventually(lambda: len(self.sessions(name)) >= count and
                           all(session["ended"] for session in self.sessions(name)))
        need(found, [dict(session) for session in self.sessions()] + [self.adapter_log()])
        return self.sessions(name)

    def messages(self, session, name):
        """The payloads of the messages of this name in a session, as a summary file's are: in order."""
        return [json.loads(row["payload"]) for row in
                self.rows("SELECT payload FROM events WHERE session = ? AND backend = 'tally' AND name = ? ORDER BY id",
                          session["id"], "sys.oxbow.tarnkit." + name)]

    def one(self, name):
        """The only session of the application, ended."""
        sessions = self.ended(name)
        need(len(sessions) == 1, [dict(session) for session in sessions])
        return sessions[0]


class Headless(unittest.TestCase, Machine):
    """Each test has its own of everything."""

    managed = True

    def setUp(self):
        Machine.__init__(self, self.managed,
                         [os.environ[name] for name in ("TARNREPORTINGD", "TARNREPORTINGCTL", "ADAPTER")])
        self.addCleanup(self.close)

    def heard(self, name, message="Playback.Start", count=1):
        """Waits until so many of these messages of the stream are recorded, so that what comes next is told apart."""
        self.assertTrue(eventually(lambda: self.sessions(name) and
                                   len(self.messages(self.sessions(name)[0], message)) >= count), (name, message))

    def streamer(self, name, seconds, *words):
        """The tests' own stream, once sound flows."""
        process = self.spawn(os.environ["STREAMER"], name, str(seconds), *words, stdout=subprocess.PIPE, text=True)
        self.addCleanup(process.stdout.close)
        streamer = Streamer(process)
        streamer.saw("flows")
        return streamer
