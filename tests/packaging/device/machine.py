# SPDX-License-Identifier: Apache-2.0
"""A tree that is booted, and what is run inside it."""

import json
import re
import subprocess
import time

SECONDS = 120


class Machine:
    """A tree that is booted; its processes are those of a namespace of its own."""

    def __init__(self, tree):
        self.log = open(tree + ".log", "w+", encoding="utf-8", errors="replace")
        self.console = subprocess.Popen(
            ["systemd-nspawn", "--quiet", "-D", tree, "--register=no", "--keep-unit", "--boot"],
            stdin=subprocess.DEVNULL, stdout=self.log, stderr=subprocess.STDOUT)
        self.init = self.until("it has a first process", self.first_process)
        self.until("it is up", lambda: self.run("systemctl", "is-system-running").stdout.strip()
                   in ("running", "degraded"))

    def first_process(self):
        """Its number here. The manager's child that is the first of its own numbers."""
        with open(f"/proc/{self.console.pid}/task/{self.console.pid}/children", encoding="utf-8") as file:
            for child in file.read().split():
                with open(f"/proc/{child}/status", encoding="utf-8") as status:
                    if re.search(r"^NSpid:\s+\d+\s+1$", status.read(), re.MULTILINE):
                        return child
        return None

    def inside(self, *command):
        return ["nsenter", "--target", self.init, "--mount", "--uts", "--ipc", "--net", "--pid", "--root", "--wd",
                "env", "-i", "PATH=/usr/sbin:/usr/bin:/sbin:/bin", "HOME=/root", "LC_ALL=C.UTF-8",
                "DEBIAN_FRONTEND=noninteractive", *command]

    def run(self, *command, patience=SECONDS):
        return subprocess.run(self.inside(*command), stdin=subprocess.DEVNULL, capture_output=True, text=True,
                              timeout=patience, check=False)

    def load(self, *command):
        """A program that runs inside until its input ends, once it has said its first line."""
        return Load(subprocess.Popen(self.inside(*command), stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True))

    def files(self):
        """The names of all files, but for what the kernel shows."""
        return set(self.run("find", "/", "-xdev", "-not", "-path", "/proc/*").stdout.splitlines())

    def until(self, what, condition):
        end = time.monotonic() + SECONDS
        while time.monotonic() < end:
            if found := condition():
                return found
            if self.console.poll() is not None:
                break
            time.sleep(0.2)
        self.log.seek(0)
        raise AssertionError(f"never: {what}\n{self.log.read()[-4000:]}")

    def end(self):
        self.console.terminate()  # which nspawn makes a shutdown of
        try:
            self.console.wait(30)
        except subprocess.TimeoutExpired:
            self.console.kill()
            self.console.wait()
        self.log.close()


class Load:
    """A program of load.py's kind."""

    def __init__(self, process):
        self.process = process
        if not process.stdout.readline():
            raise AssertionError(f"the program ended with {process.wait()} before its first line")

    def end(self):
        """What it told at its end."""
        told, _ = self.process.communicate(timeout=SECONDS)
        return json.loads(told)
