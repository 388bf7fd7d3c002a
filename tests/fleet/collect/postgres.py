# SPDX-License-Identifier: Apache-2.0
"""A PostgreSQL server on a private directory, and questions to it."""

import glob
import os
import pwd
import shutil
import signal
import subprocess
import time

PATIENCE = 60


def program(name):
    """The newest one; Debian keeps them apart from what everybody runs."""
    apart = sorted(glob.glob(f"/usr/lib/postgresql/*/bin/{name}"), key=lambda path: float(path.split("/")[4]))
    return apart[-1] if apart else shutil.which(name)


def as_user():
    """What stands before a command so that it doesn't run as root, which the server refuses; None where nobody is."""
    if os.geteuid() != 0:
        return []
    try:
        user = pwd.getpwnam("postgres")
    except KeyError:
        return None
    return ["setpriv", f"--reuid={user.pw_uid}", f"--regid={user.pw_gid}", "--clear-groups"]


def lacking():
    """What is missing for a server here, empty when nothing is."""
    if not all(program(name) for name in ("initdb", "postgres", "psql")):
        return "PostgreSQL is not installed here"
    return "" if as_user() is not None else "there is no user postgres here"


class Database:
    """Started and killed as often as a test likes; it keeps its directory. Nothing is synced unless `safe`: a killed
    program loses nothing that the system has."""

    def __init__(self, folder, safe=False, extra=()):
        self.folder, self.process, self.extra = os.path.join(folder, "postgres"), None, list(extra)
        self.log = os.path.join(folder, "postgres.log")
        os.mkdir(self.folder)
        if os.geteuid() == 0:
            os.chmod(folder, 0o755)
            shutil.chown(self.folder, "postgres")
        os.chmod(self.folder, 0o700)
        subprocess.run([*as_user(), program("initdb"), "-D", self.folder, "-U", "fleet", "-A", "trust", "-E", "UTF8",
                        "--locale=C", "--no-sync"], check=True, stdout=subprocess.DEVNULL, cwd="/")
        if not safe:
            self.extra += ["-c", "fsync=off"]

    @property
    def url(self):
        return f"host={self.folder} user=fleet dbname=postgres"

    def start(self):
        with open(self.log, "ab") as log:
            self.process = subprocess.Popen(
                [*as_user(), program("postgres"), "-D", self.folder, "-k", self.folder, "-c", "listen_addresses=",
                 *self.extra], stdout=log, stderr=log, cwd="/")
        until = time.monotonic() + PATIENCE
        while time.monotonic() < until:
            try:
                return self.ask("SELECT 1")
            except RuntimeError:
                time.sleep(0.1)
        raise RuntimeError("PostgreSQL doesn't answer")

    def end(self, how=signal.SIGINT):
        """SIGINT is the server's word for at once; SIGKILL leaves its parts to notice."""
        if self.process and self.process.poll() is None:
            self.process.send_signal(how)
            self.process.wait()

    def ask(self, sql):
        """Rows of texts."""
        done = subprocess.run([program("psql"), "-XAtq", "-F", "\t", "-v", "ON_ERROR_STOP=1", "-d", self.url, "-c",
                               sql], capture_output=True, text=True, check=False)
        if done.returncode != 0:
            raise RuntimeError(done.stderr)
        return [line.split("\t") for line in done.stdout.splitlines()]

    def number(self, sql):
        return float(self.ask(sql)[0][0])
