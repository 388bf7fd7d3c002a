# SPDX-License-Identifier: Apache-2.0
"""Installs the packages into a fresh Debian 12 tree, boots it and uses the service as the README says: its first client
starts it through the socket, what it sends is recorded, the service comes back after a crash and after a hang, an
installation of the packages over themselves keeps the socket, and a purge leaves nothing. What this machine can't do is
named and passed over.

usage: fresh_machine.py FOLDER_OF_PACKAGES [--mirror URL]
"""

import argparse
import glob
import os
import re
import shutil
import subprocess
import sys
import tempfile
import time
import unittest

TOOLS = ("mmdebstrap", "systemd-nspawn", "nsenter")
# What a tree needs to boot and to install the packages; their own dependencies come with them.
INCLUDED = ("systemd", "systemd-sysv", "dbus")
PACKAGES = ("tarnreporting", "tarnreporting-tools", "libtarnreporting1", "python3-tarnreporting")
STATE = "/var/lib/tarnreporting"
SECONDS = 120
# What the packages' own test does.
FIRST_CLIENT = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..", "debian", "tests", "first-client")
options = argparse.Namespace()


def why_not():
    """What keeps this machine from it; empty when nothing does."""
    if os.geteuid() != 0:
        return "only root can boot a tree"
    absent = [tool for tool in TOOLS if not shutil.which(tool)]
    return "not installed here: " + ", ".join(absent) if absent else ""


def package_files():
    return [path for path in glob.glob(os.path.join(options.packages, "*.deb"))
            if os.path.basename(path).split("_")[0] in PACKAGES]


def dependencies():
    """The packages of others that ours ask for, so that installing ours asks the network for nothing."""
    names = set()
    for path in package_files():
        fields = subprocess.run(["dpkg-deb", "-f", path, "Depends", "Pre-Depends"], capture_output=True, text=True,
                                check=True).stdout
        for choice in re.split(r"[,\n]", re.sub(r"^[\w-]+: ", "", fields, flags=re.MULTILINE)):
            name = choice.split("|")[0].split("(")[0].strip().split(":")[0]
            if name and name not in PACKAGES:
                names.add(name)
    return sorted(names)


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

    def run(self, *command):
        inside = ["nsenter", "--target", self.init, "--mount", "--uts", "--ipc", "--net", "--pid", "--root", "--wd",
                  "env", "-i", "PATH=/usr/sbin:/usr/bin:/sbin:/bin", "HOME=/root", "LC_ALL=C.UTF-8",
                  "DEBIAN_FRONTEND=noninteractive"]
        return subprocess.run([*inside, *command], stdin=subprocess.DEVNULL, capture_output=True, text=True,
                              timeout=SECONDS, check=False)

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


class FreshMachine(unittest.TestCase):
    """One story, in its order: each test stands on what those before it left."""

    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.mkdtemp(prefix="tarnmachine", dir=options.packages)
        tree = os.path.join(cls.folder, "tree")
        cls.tree = tree
        began = time.monotonic()
        subprocess.run(["mmdebstrap", "--quiet", "--variant=minbase",
                        "--include=" + ",".join([*INCLUDED, *dependencies()]), "bookworm", tree,
                        *([options.mirror] if options.mirror else [])],
                       check=True, stdin=subprocess.DEVNULL)
        print(f"the tree is there after {time.monotonic() - began:.0f} s", flush=True)
        os.mkdir(os.path.join(tree, "packages"))
        for path in [*package_files(), FIRST_CLIENT]:
            shutil.copy(path, os.path.join(tree, "packages"))
        began = time.monotonic()
        try:
            cls.machine = Machine(tree)
        except BaseException:
            cls.tearDownClass()
            raise
        print(f"it is up after {time.monotonic() - began:.0f} s", flush=True)

    @classmethod
    def tearDownClass(cls):
        if hasattr(cls, "machine"):
            cls.machine.end()
        shutil.rmtree(cls.folder, ignore_errors=True)

    def does(self, *command):
        done = self.machine.run(*command)
        self.assertEqual(done.returncode, 0, f"{command}: {done.stdout}{done.stderr}")
        return done.stdout

    def state(self, unit, what="ActiveState"):
        return self.does("systemctl", "show", "--value", f"--property={what}", unit).strip()

    def install(self, *words):
        paths = ["/packages/" + os.path.basename(path) for path in package_files()]
        return self.does("apt-get", "install", "--yes", "--quiet", *words, *paths)

    def events(self):
        return self.does("tarnreportingctl", "events", "--settled")

    def test_1_installing_brings_a_socket_and_no_service_yet(self):
        self.install()
        self.assertEqual(self.state("tarnreportingd.socket"), "active")
        self.assertEqual(self.state("tarnreportingd.service"), "inactive")
        self.assertEqual(self.does("systemctl", "is-enabled", "tarnreportingd.socket").strip(), "enabled")

    def test_2_the_first_client_starts_the_service_and_its_message_is_recorded(self):
        self.assertIn("Playback.Start", self.does("/packages/first-client"))
        self.assertEqual(self.state("tarnreportingd.service"), "active")
        self.assertIn("sys.oxbow.tarnkit.Playback.Start", self.events())
        self.assertEqual(self.does("stat", "-c", "%U %G %a", STATE).strip(), "tarnreporting tarnreporting 750")
        self.assertIn("tarnreportingd 0.", self.does("tarnreportingd", "--version"))

    def test_3_members_of_the_group_report_and_others_do_not(self):
        self.does("useradd", "--groups", "tarnreporting", "member")
        self.does("useradd", "stranger")
        self.does("runuser", "-u", "member", "--", "tarnreportingctl", "status")
        refused = self.machine.run("runuser", "-u", "stranger", "--", "tarnreportingctl", "status")
        self.assertEqual(refused.returncode, 69, refused.stdout + refused.stderr)

    def test_4_python_reports_through_the_installed_library(self):
        self.does("python3", "-c", "import tarnreporting as t\n"
                  "with t.Client() as client:\n"
                  "    with client.session(t.ServiceType.LONG_FORM_AUDIO, 'org.example.python') as session:\n"
                  "        session.output_running(0.5, 'Speaker')\n")
        self.assertIn("org.example.python", self.does("tarnreportingctl", "sessions"))

    def test_5_a_setting_dropped_in_holds_after_a_restart_and_a_wrong_one_stops_it(self):
        self.does("sh", "-c", "mkdir -p /etc/tarnreporting/tarnreportingd.toml.d && "
                  "printf '[wrong]\\n' > /etc/tarnreporting/tarnreportingd.toml.d/50-site.toml")
        self.machine.run("systemctl", "restart", "tarnreportingd.service")
        self.assertEqual(self.state("tarnreportingd.service", "ExecMainStatus"), "78")
        self.does("sh", "-c", "printf '[recorder]\\nmax_age_days = 7\\n' "
                  "> /etc/tarnreporting/tarnreportingd.toml.d/50-site.toml")
        self.does("systemctl", "reset-failed")
        self.does("systemctl", "restart", "tarnreportingd.socket")
        self.does("systemctl", "restart", "tarnreportingd.service")
        self.assertEqual(self.state("tarnreportingd.service"), "active")

    def test_6_installing_again_keeps_the_socket_and_takes_the_new_service(self):
        since = self.state("tarnreportingd.socket", "InvocationID")
        before = self.state("tarnreportingd.service", "MainPID")
        self.install("--reinstall")
        self.assertEqual(self.state("tarnreportingd.socket", "InvocationID"), since)
        self.assertEqual(self.state("tarnreportingd.service"), "active")
        self.assertNotEqual(self.state("tarnreportingd.service", "MainPID"), before)
        self.assertIn("sys.oxbow.tarnkit.Playback.Start", self.events())

    def replaced(self, signal):
        before = self.state("tarnreportingd.service", "MainPID")
        self.does("systemctl", "kill", f"--signal={signal}", "--kill-whom=main", "tarnreportingd.service")
        self.machine.until("another process serves", lambda: self.state("tarnreportingd.service", "MainPID")
                           not in (before, "0"))
        self.does("tarnreportingctl", "--wait=60", "status")

    def test_7_the_service_comes_back_after_a_kill(self):
        self.replaced("KILL")
        self.assertIn("sys.oxbow.tarnkit.Playback.Start", self.events())

    def test_8_the_watchdog_ends_a_service_that_hangs(self):
        self.replaced("STOP")

    def test_9_a_purge_leaves_nothing(self):
        self.does("apt-get", "purge", "--yes", "--quiet", *PACKAGES)
        left = self.does("sh", "-c", f"ls -d {STATE} /etc/tarnreporting /run/tarnreporting /usr/lib/tarnkit "
                         "/lib/systemd/system/tarnreporting* /etc/systemd/system/*/tarnreporting* 2>/dev/null || true")
        self.assertEqual(left, "")
        self.assertNotIn("tarnreporting", self.does("systemctl", "list-units", "--all", "--plain", "--no-legend"))


if __name__ == "__main__":
    parser = argparse.ArgumentParser(usage=__doc__)
    parser.add_argument("packages")
    parser.add_argument("--mirror")
    options = parser.parse_args()
    if reason := why_not():
        print(f"fresh machine: not tried: {reason}")
        sys.exit(0)
    if not package_files():
        sys.exit(f"fresh machine: no packages in {options.packages}")
    unittest.main(argv=sys.argv[:1], failfast=True, verbosity=2)
