# SPDX-License-Identifier: Apache-2.0
"""The real service on private directories: started, waited for, killed, and its store read as anybody would."""

import ctypes
import os
import select
import signal
import socket
import sqlite3
import subprocess
import time

import wire

PATIENCE = 30
# A writer that waits for company for a commit naps for a millisecond or two, as does whoever waits for memory.
LONGEST_NAP = 0.006
PARENT_DEATH_SIGNAL = 1
# Becomes the program with what was its standard input as the socket that it is handed, which is for its process alone.
HAND_OVER = ("/bin/sh", "-c", 'export LISTEN_PID=$$ LISTEN_FDS=1; exec "$@" 3<&0 0</dev/null', "sh")
LIBC = ctypes.CDLL(None)


def end_with_parent():
    """In a child: it is killed when the campaign ends, however that ends."""
    LIBC.prctl(PARENT_DEATH_SIGNAL, signal.SIGKILL)


class Service:
    """One state directory and one socket, with at most one running service; started as often as a campaign likes."""

    def __init__(self, program, folder, configuration="", environment=None, arguments=(), before=lambda: None,
                 holds_socket=False):
        self.program, self.folder = program, folder
        os.makedirs(folder, exist_ok=True)
        self.state = os.path.join(folder, "state")
        self.socket = os.path.join(folder, "socket")
        self.log = os.path.join(folder, "log")
        self.configuration = os.path.join(folder, "config.toml")
        self.environment = dict(environment or {})
        self.arguments = list(arguments)
        self.before = before  # called in the process, before it becomes the service
        self.process = None
        self.listener = self.listen() if holds_socket else None
        with open(self.configuration, "w", encoding="utf-8") as file:
            file.write(configuration)

    def listen(self):
        """A socket that stays while the service ends and starts, as that of a service manager does."""
        listener = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
        listener.bind(self.socket)
        listener.listen(4096)
        return listener

    @property
    def store(self):
        return os.path.join(self.state, "recorder.sqlite3")

    def start(self, environment=None, patience=PATIENCE):
        """Starts it and waits until it is ready. Whether it is: False when it ended instead."""
        path = os.path.join(self.folder, "notify")
        if os.path.exists(path):
            os.unlink(path)
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as manager, open(self.log, "ab") as log:
            manager.bind(path)
            command = [self.program, "--state-dir", self.state, "--config", self.configuration, "--log-level", "error",
                       *self.arguments]
            command = [*HAND_OVER, *command] if self.listener else [*command, "--socket", self.socket]
            self.process = subprocess.Popen(
                command, stdin=self.listener or subprocess.DEVNULL, stdout=log, stderr=log, preexec_fn=self.prepare,
                env={**os.environ, "NOTIFY_SOCKET": path, **self.environment, **(environment or {})})
            return self.wait_until_ready(manager, patience)

    def prepare(self):
        end_with_parent()
        self.before()

    def wait_until_ready(self, manager, patience):
        begun = time.monotonic()
        while self.process.poll() is None:
            if select.select([manager], [], [], 0.02)[0] and b"READY=1" in manager.recv(4096):
                return True
            waited = time.monotonic() - begun
            # The word to the manager may be what the campaign lets fail.
            if waited > 1 and self.listener is None and self.is_listening():
                return True
            if waited > patience:
                self.kill()
                raise TimeoutError(f"the service wasn't ready within {patience} s")
        return False

    def is_listening(self):
        try:
            wire.Client(self.socket, 1).close()
        except OSError:
            return False
        return True

    def connect(self, patience=PATIENCE):
        return wire.Client(self.socket, patience)

    def is_running(self):
        return self.process is not None and self.process.poll() is None

    def ends_within(self, seconds):
        """Whether it ends by itself in that time; one that dies closes its sockets some moments before."""
        if self.process.poll() is not None:
            return True
        # Popen.wait() would look again each 50 ms.
        file = os.pidfd_open(self.process.pid)
        try:
            ending = select.poll()
            ending.register(file, select.POLLIN)
            ended = bool(ending.poll(seconds * 1000))
        finally:
            os.close(file)
        return ended and self.process.wait() is not None

    def comes_to_rest(self, progress, patience=PATIENCE):
        """Waits until all its threads sleep, longer than any does between two parts of one work. Whether they do, or
        it ended. What `progress` tells moves on with the work.
        """
        deadline = time.monotonic() + patience
        since, seen = time.monotonic(), None
        while self.is_running():
            now, made = time.monotonic(), progress()
            if not self.sleeps() or made != seen:
                since, seen = now, made
            elif now - since >= LONGEST_NAP:
                return True
            if now > deadline:
                return False
            time.sleep(0.001)
        return True

    def sleeps(self):
        try:
            for thread in os.listdir(f"/proc/{self.process.pid}/task"):
                with open(f"/proc/{self.process.pid}/task/{thread}/stat", encoding="utf-8", errors="replace") as file:
                    if file.read().rpartition(")")[2].split()[0] != "S":
                        return False
        except (FileNotFoundError, ProcessLookupError):  # it has ended in the meantime
            return False
        return True

    def kill(self):
        if self.process is not None:
            self.process.kill()
            self.process.wait()

    def stop(self, number=signal.SIGTERM, patience=PATIENCE):
        """Its exit status (negative: the signal that ended it), None when it had to be killed at the deadline."""
        self.process.send_signal(number)
        if self.ends_within(patience):
            return self.process.returncode
        self.kill()
        return None

    def log_text(self):
        try:
            with open(self.log, encoding="utf-8", errors="replace") as file:
                return file.read()
        except FileNotFoundError:
            return ""

    def forget_log(self):
        open(self.log, "wb").close()

    def reader(self):
        return sqlite3.connect(f"file:{self.store}?mode=ro", uri=True, timeout=10, check_same_thread=False,
                               isolation_level=None)

    def memory_peak(self):
        """MiB that were resident at the most since the start."""
        with open(f"/proc/{self.process.pid}/status", encoding="ascii") as file:
            for line in file:
                if line.startswith("VmHWM:"):
                    return int(line.split()[1]) / 1024
        return 0.0


def settled(client, patience=PATIENCE):
    """Waits until all that the service took is committed, by the settle operation or by the ledger."""
    if client.settle():
        return
    deadline = time.monotonic() + patience
    while True:
        status = client.call(wire.STATUS)
        if status["queued"] == 0 and status["recorder_waiting"] == 0:
            return
        if time.monotonic() > deadline:
            raise wire.WireError("what was sent isn't committed in time")
        time.sleep(0.002)
