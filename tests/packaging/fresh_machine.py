# SPDX-License-Identifier: Apache-2.0
"""Installs the packages into a fresh Debian 12 tree, boots it and uses the service there as the README says, and as the
years on a device do: the first client starts it through the socket, settings are read anew, good and broken ones, and
while a program reports some 5,000 messages a second it is restarted, killed, hung, upgraded, and its journal flooded,
stalled and taken away. What was accepted is recorded, once, and no call of the program fails. A purge leaves nothing.
What this machine can't do is named and passed over.

usage: fresh_machine.py FOLDER_OF_PACKAGES [--before FOLDER] [--restarts N] [--kills N] [--reloads N] [--mirror URL]

--before: packages of an earlier version, which are installed first and upgraded in between.
"""

import argparse
import glob
import json
import os
import re
import shutil
import statistics
import subprocess
import sys
import tempfile
import time
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
ROOT = os.path.join(HERE, "..", "..")
sys.path.insert(0, os.path.join(HERE, "device"))
from machine import Machine  # noqa: E402

TOOLS = ("mmdebstrap", "systemd-nspawn", "nsenter")
# What a tree needs to boot and to install the packages; their own dependencies come with them.
INCLUDED = ("systemd", "systemd-sysv", "dbus")
OURS = re.compile(r"(lib|python3-)?tarnreporting")
STATE = "/var/lib/tarnreporting"
SERVICE, SOCKET = "tarnreportingd.service", "tarnreportingd.socket"
# What a program of the story reports a second.
RATE = 5000
# How often the service is restarted or killed beside one program, whose messages are looked at then.
ROOM = 16384  # megabytes
ENDS_A_PROGRAM = 25
SCRIPT = os.path.join(ROOT, "debian", "tests", "script.jsonl")
# What is run inside.
BROUGHT = [*glob.glob(os.path.join(HERE, "device", "inside", "*.py")),
           *glob.glob(os.path.join(ROOT, "debian", "tests", "*")),
           os.path.join(ROOT, "tests", "campaigns", "wire.py")]
options = argparse.Namespace()


def why_not():
    """What keeps this machine from it; empty when nothing does."""
    if os.geteuid() != 0:
        return "only root can boot a tree"
    absent = [tool for tool in TOOLS if not shutil.which(tool)]
    return "not installed here: " + ", ".join(absent) if absent else ""


def package_files(folder):
    return sorted(glob.glob(os.path.join(folder, "*.deb")))


def name_of(path):
    return os.path.basename(path).split("_")[0]


def dependencies():
    """The packages of others that ours ask for, so that installing ours asks the network for nothing."""
    names = set()
    for path in package_files(options.packages):
        fields = subprocess.run(["dpkg-deb", "-f", path, "Depends", "Pre-Depends"], capture_output=True, text=True,
                                check=True).stdout
        for choice in re.split(r"[,\n]", re.sub(r"^[\w-]+: ", "", fields, flags=re.MULTILINE)):
            name = choice.split("|")[0].split("(")[0].strip().split(":")[0]
            if name and not OURS.match(name):
                names.add(name)
    return sorted(names)


def readme_commands():
    """The commands of the README's block for a device, without what is said of them."""
    with open(os.path.join(ROOT, "README.md"), encoding="utf-8") as file:
        block = file.read().split("## On a device")[1].split("\n##")[0]
    return [line.strip().split("  #")[0].strip() for line in block.splitlines() if line.startswith("    ")]


class FreshMachine(unittest.TestCase):
    """One story, in its order: each test stands on what those before it left."""

    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.mkdtemp(prefix="tarnmachine", dir=options.packages)
        tree = os.path.join(cls.folder, "tree")
        began = time.monotonic()
        subprocess.run(["mmdebstrap", "--quiet", "--variant=minbase",
                        "--include=" + ",".join([*INCLUDED, *dependencies()]), "bookworm", tree,
                        *([options.mirror] if options.mirror else [])],
                       check=True, stdin=subprocess.DEVNULL)
        print(f"the tree is there after {time.monotonic() - began:.0f} s", flush=True)
        for name, paths in (("packages", package_files(options.packages)),
                            ("before", package_files(options.before) if options.before else []),
                            ("story", BROUGHT)):
            os.mkdir(os.path.join(tree, name))
            for path in paths:
                shutil.copy(path, os.path.join(tree, name))
        shutil.copy(SCRIPT, os.path.join(tree, "packages"))
        began = time.monotonic()
        try:
            cls.machine = Machine(tree)
        except BaseException:
            cls.tearDownClass()
            raise
        print(f"it is up after {time.monotonic() - began:.0f} s", flush=True)
        cls.files_before = cls.machine.files()
        cls.programs = 0

    @classmethod
    def tearDownClass(cls):
        if hasattr(cls, "machine"):
            cls.machine.end()
        shutil.rmtree(cls.folder, ignore_errors=True)

    def does(self, *command, patience=120):
        done = self.machine.run(*command, patience=patience)
        self.assertEqual(done.returncode, 0, f"{command}: {done.stdout}{done.stderr}")
        return done.stdout

    def tells(self, program, *arguments, patience=120):
        """What one of the story's programs prints as JSON."""
        return json.loads(self.does("python3", "-B", f"/story/{program}.py", *map(str, arguments), patience=patience))

    def state(self, unit, what="ActiveState"):
        return self.does("systemctl", "show", "--value", f"--property={what}", unit).strip()

    def install(self, folder, *words):
        return self.does("sh", "-c", f"apt-get install --yes --quiet {' '.join(words)} /{folder}/*.deb")

    def status(self):
        return json.loads(self.does("tarnreportingctl", "--wait=60", "status", "--json"))

    def events(self):
        return self.does("tarnreportingctl", "--wait=60", "events", "--settled")

    def journal(self):
        return self.does("journalctl", "--quiet", "--output=cat", f"--unit={SERVICE}")

    def reported(self, happens, killed=False):
        """What happens while a program reports: no call of it fails, what it posted is recorded, once, and each period
        of its sessions has its summary. Only a kill may cost what was not committed yet."""
        cls = type(self)
        cls.programs += 1
        load = self.machine.load("python3", "-B", "/story/load.py", str(self.programs), str(RATE))
        began = time.monotonic()
        told = happens()
        seconds = time.monotonic() - began
        program = load.end()
        self.assertEqual((program["error"], program["no_room"], program["left"]), ("", 0, 0))
        self.does("tarnreportingctl", "--wait=60", "events", "--settled", "--limit=1")
        # The last session's end isn't waited for by the program.
        self.machine.until("no session of it is left", lambda: self.status()["sessions"] == 0)
        self.does("systemctl", "stop", SERVICE)
        stored = self.tells("recorded", self.programs)
        lost = program["posted"] - stored["different"]
        print(f"    {program['posted']} posted in {seconds:.1f} s, {program['sessions']} sessions, {stored['rows']} "
              f"recorded, {lost} lost, {stored['rows'] - stored['different']} doubled, {stored['periods']} periods so "
              f"far, {len(stored['odd'])} odd", flush=True)
        self.assertEqual(stored["odd"], [])
        self.assertFalse(stored["removed"], "the cap is reached: this would not tell a loss")
        self.assertEqual(stored["rows"], stored["different"])
        self.assertGreaterEqual(lost, 0)
        self.assertLessEqual(lost, program["posted"] if killed else 0)
        self.assertGreater(stored["different"], 0)
        return told, lost

    def ends(self, count, how):
        """So many ends of the service beside programs; the milliseconds until it answered again."""
        waits, lost = [], 0
        while len(waits) < count:
            number = min(ENDS_A_PROGRAM, count - len(waits))
            told, missing = self.reported(lambda n=number: self.tells("restarts", n, how, patience=600),
                                          killed=how == "kill")
            waits += told
            lost += missing
        print(f"    {count} times: {how}: back after {statistics.median(waits):.0f} ms at the median, {max(waits):.0f} "
              f"ms at the most; load {os.getloadavg()[0]:.1f}", flush=True)
        return lost

    def test_01_three_commands_lead_from_the_packages_to_the_first_event(self):
        commands = readme_commands()
        self.assertEqual(len(commands), 3)
        told = self.does("sh", "-c", f"cd /packages && {commands[0]}")
        self.assertEqual(self.state(SOCKET), "active", told)
        self.assertEqual(self.does("systemctl", "is-enabled", SOCKET).strip(), "enabled")
        self.assertEqual(self.state(SERVICE), "inactive")
        self.does("sh", "-c", f"cd /packages && {commands[1]}")
        self.assertEqual(self.state(SERVICE), "active")
        self.assertIn("sys.oxbow.tarnkit.Playback.Start", self.does("sh", "-c", f"cd /packages && {commands[2]}"))
        self.assertEqual(self.does("stat", "-c", "%U %G %a", STATE).strip(), "tarnreporting tarnreporting 750")
        self.assertIn("tarnreportingd 0.", self.does("tarnreportingd", "--version"))

    def test_02_the_packages_own_tests_hold(self):
        with open(os.path.join(ROOT, "debian", "tests", "control"), encoding="utf-8") as file:
            names = re.findall(r"^Tests: (.*)$", file.read(), re.MULTILINE)
        for name in " ".join(names).replace(",", " ").split():
            self.does("sh", "-c", f"cd /story && AUTOPKGTEST_TMP=/tmp ./{name}")

    def test_03_the_units_are_right_and_little_is_exposed(self):
        units = [SERVICE, *self.does("sh", "-c", "cd /lib/systemd/system && ls tarnreporting*.socket").split()]
        done = self.machine.run("systemd-analyze", "verify", "--man=no", *units)
        self.assertEqual((done.returncode, done.stdout + done.stderr), (0, ""))
        # PipeWire's own unit, to which its adapter is bound, isn't in this tree.
        user = [name for name in self.does("sh", "-c", "cd /usr/lib/systemd/user && ls tarnreporting*").split()
                if name != "tarnreporting-pipewire.service"]
        done = self.machine.run("env", "XDG_RUNTIME_DIR=/tmp", "systemd-analyze", "--user", "verify", "--man=no", *user)
        told = "\n".join(line for line in (done.stdout + done.stderr).splitlines() if "tarnreporting" in line)
        self.assertEqual(told, "")
        table = self.does("systemd-analyze", "security", "--no-pager", SERVICE)
        exposure = float(re.search(r"Overall exposure level for \S+: ([0-9.]+)", table).group(1))
        print(f"    exposure {exposure}", flush=True)
        self.assertLessEqual(exposure, 0.7)

    def test_04_members_of_the_group_report_and_others_do_not(self):
        self.does("useradd", "--groups", "tarnreporting", "member")
        self.does("useradd", "stranger")
        self.does("runuser", "-u", "member", "--", "tarnreportingctl", "status")
        refused = self.machine.run("runuser", "-u", "stranger", "--", "tarnreportingctl", "status")
        self.assertEqual(refused.returncode, 69, refused.stdout + refused.stderr)
        self.assertIn("good", self.does("tarnreportingctl", "check"))

    def test_05_python_reports_through_the_installed_library(self):
        self.does("python3", "-c", "import tarnreporting as t\n"
                  "with t.Client() as client:\n"
                  "    with client.session(t.ServiceType.LONG_FORM_AUDIO, 'org.example.python') as session:\n"
                  "        session.output_running(0.5, 'Speaker')\n")
        self.assertIn("org.example.python", self.does("tarnreportingctl", "sessions"))

    def test_06_the_adapters_start_and_say_what_they_lack(self):
        for adapter in ("tarnreporting-pipewire", "tarnreporting-alsa"):
            if not any(name_of(path) == adapter for path in package_files(options.packages)):
                print(f"    {adapter}: no package here", flush=True)
                continue
            self.assertIn(adapter + " 0.", self.does(adapter, "--version"))
            self.assertIn("enabled", self.does("systemctl", "--global", "is-enabled", adapter + ".service"))

    def test_07_settings_are_read_anew_and_broken_ones_leave_the_old_ones(self):
        # A thousand reloads or restarts leave more than the cap that is there by default.
        self.does("sh", "-c", "mkdir -p /etc/tarnreporting/tarnreportingd.toml.d && "
                  f"printf '[recorder]\\nmax_megabytes = {ROOM}\\n' "
                  "> /etc/tarnreporting/tarnreportingd.toml.d/70-room.toml")
        self.does("systemctl", "reload-or-restart", SERVICE)
        told, _ = self.reported(lambda: self.tells("reloads", options.reloads, patience=600))
        print(f"    {told['good']} good, {told['broken']} broken reloads", flush=True)
        self.assertEqual(told["wrong"], [])
        self.assertTrue(told["live"])
        self.assertEqual(told["good"] + told["broken"], options.reloads)
        if told["broken"]:
            self.assertIn("90-reloads.toml", self.journal())

    def test_08_a_wrong_setting_at_the_start_ends_it_until_it_is_mended(self):
        self.does("sh", "-c", "printf '[wrong]\\n' > /etc/tarnreporting/tarnreportingd.toml.d/50-site.toml")
        self.machine.run("systemctl", "restart", SERVICE)
        self.assertEqual(self.state(SERVICE, "ExecMainStatus"), "78")
        self.assertIn("50-site.toml:1", self.machine.run("tarnreportingctl", "check").stdout)
        self.does("sh", "-c", "printf '[recorder]\\nmax_age_days = 7\\n' "
                  "> /etc/tarnreporting/tarnreportingd.toml.d/50-site.toml")
        self.does("systemctl", "reset-failed")
        self.does("systemctl", "restart", SOCKET)
        self.does("systemctl", "restart", SERVICE)
        self.assertEqual(self.state(SERVICE), "active")

    def test_09_only_the_admin_socket_ends_it_where_that_is_wanted(self):
        setting = "/etc/tarnreporting/tarnreportingd.toml.d/60-access.toml"
        self.does("sh", "-c", f"printf '[access]\\nadmin = \"separate\"\\n' > {setting}")
        self.does("systemctl", "restart", SERVICE)
        before = self.state(SERVICE, "MainPID")
        as_member = ("runuser", "-u", "member", "--", "tarnreportingctl")
        refused = self.machine.run(*as_member, "kill")
        self.assertEqual(refused.returncode, 1)
        self.assertIn("6 only over the admin socket (give --admin)", refused.stdout + refused.stderr)
        self.assertEqual(self.machine.run(*as_member, "--admin", "status").returncode, 69)
        self.assertEqual(self.state(SERVICE, "MainPID"), before)
        self.assertIn("good", self.does("tarnreportingctl", "check"))
        self.does("tarnreportingctl", "--admin", "kill")
        self.status()
        self.assertNotIn(self.state(SERVICE, "MainPID"), (before, "0"))
        self.does("rm", setting)
        self.does("systemctl", "restart", SERVICE)
        self.does(*as_member, "kill")
        self.status()

    def test_10_kills_are_made_good_each_time_and_lose_what_was_not_committed_at_most(self):
        # Before many restarts have made the store large, which a start after a kill reads through.
        lost = self.ends(options.kills, "kill")
        # 200 ms of what is reported a second, at each.
        self.assertLessEqual(lost, options.kills * RATE * 0.2)

    def test_11_restarts_lose_nothing(self):
        self.ends(options.restarts, "restart")

    def test_12_the_watchdog_ends_a_service_that_hangs(self):
        self.status()
        before = self.state(SERVICE, "MainPID")

        def hang():
            began = time.monotonic()
            self.does("systemctl", "kill", "--signal=STOP", "--kill-whom=main", SERVICE)
            self.machine.until("another process serves", lambda: self.state(SERVICE, "MainPID") not in (before, "0"))
            self.status()
            return time.monotonic() - began
        seconds = hang()
        print(f"    replaced after {seconds:.0f} s", flush=True)
        self.assertLess(seconds, 60)
        self.assertIn("sys.oxbow.tarnkit.Playback.Start", self.events())

    def test_13_a_flood_in_the_journal_holds_nobody(self):
        self.reported(lambda: self.does("python3", "-B", "/story/flood.py", "100000"))

    def test_14_a_journal_that_stalls_holds_nobody(self):
        def stall():
            self.does("systemctl", "kill", "--signal=STOP", "--kill-whom=main", "systemd-journald.service")
            try:
                slowest = self.tells("strangers", 300)
            finally:
                self.does("systemctl", "kill", "--signal=CONT", "--kill-whom=main", "systemd-journald.service")
            return slowest
        slowest, _ = self.reported(stall)
        print(f"    the slowest answer took {slowest:.0f} ms", flush=True)
        self.assertLess(slowest, 1000)

    def test_15_without_a_journal_it_starts_and_serves(self):
        units = [f"systemd-journald{end}" for end in (".socket", "-dev-log.socket", "-audit.socket", ".service")]

        def without():
            self.does("systemctl", "mask", "--runtime", *units)
            self.machine.run("systemctl", "stop", *units)
            try:
                self.does("systemctl", "restart", SERVICE)
                return self.status()
            finally:
                self.does("systemctl", "unmask", "--runtime", *units)
                self.machine.run("systemctl", "start", *reversed(units))
        self.reported(without)
        self.does("systemctl", "restart", SERVICE)
        self.assertEqual(self.state(SERVICE), "active")

    def test_16_an_upgrade_keeps_the_socket_and_loses_nothing(self):
        if options.before:
            # Its settings would outlive it, and the service of before may not know them.
            self.does("apt-get", "purge", "--yes", "tarnreporting-export")
            self.install("before", "--allow-downgrades")
            self.does("systemctl", "restart", SERVICE)
        since = self.state(SOCKET, "InvocationID")
        self.status()
        before = self.state(SERVICE, "MainPID")
        version = self.does("dpkg-query", "-W", "-f", "${Version}", "tarnreporting")

        def upgrade():
            time.sleep(1)
            self.install("packages", "--reinstall")
            time.sleep(1)
            return self.state(SERVICE, "MainPID")
        after, _ = self.reported(upgrade)
        print(f"    from {version} to {self.does('dpkg-query', '-W', '-f', '${Version}', 'tarnreporting')}", flush=True)
        self.assertEqual(self.state(SOCKET, "InvocationID"), since)
        self.assertNotIn(after, (before, "0"))
        self.assertIn("sys.oxbow.tarnkit.Playback.Start", self.events())

    def test_17_a_purge_leaves_nothing(self):
        names = sorted({name_of(path) for path in package_files(options.packages)})
        self.does("apt-get", "purge", "--yes", "--quiet", *names)
        left = sorted(name for name in self.machine.files() - self.files_before if "tarn" in name.lower())
        self.assertEqual(left, [])
        self.assertNotIn("tarnreporting", self.does("systemctl", "list-units", "--all", "--plain", "--no-legend"))


if __name__ == "__main__":
    parser = argparse.ArgumentParser(usage=__doc__)
    parser.add_argument("packages")
    parser.add_argument("--before")
    parser.add_argument("--restarts", type=int, default=20)
    parser.add_argument("--kills", type=int, default=10)
    parser.add_argument("--reloads", type=int, default=50)
    parser.add_argument("--mirror")
    options = parser.parse_args()
    if reason := why_not():
        print(f"fresh machine: not tried: {reason}")
        sys.exit(0)
    if not package_files(options.packages):
        sys.exit(f"fresh machine: no packages in {options.packages}")
    unittest.main(argv=sys.argv[:1], failfast=True, verbosity=2)
