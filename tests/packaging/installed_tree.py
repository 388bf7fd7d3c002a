# SPDX-License-Identifier: Apache-2.0
"""Installs the build into a folder of its own and looks at what came: files, programs, units, the client package."""

import argparse
import os
import re
import shlex
import shutil
import socket
import subprocess
import sys
import tempfile
import unittest

PROGRAMS = ("tarnreportingd", "tarnreportingctl")
FILES = (
    "lib/systemd/system/tarnreportingd.service", "lib/systemd/system/tarnreportingd.socket",
    "lib/systemd/system/tarnreportingd-admin.socket", "lib/systemd/user/tarnreportingd-admin.socket",
    "lib/systemd/user/tarnreportingd.service", "lib/systemd/user/tarnreportingd.socket",
    "share/bash-completion/completions/tarnreportingd", "share/zsh/site-functions/_tarnreportingctl",
    "share/fish/vendor_completions.d/tarnreportingctl.fish",
    "lib/sysusers.d/tarnreporting.conf", "lib/systemd/catalog/tarnreporting.catalog",
    "lib/tmpfiles.d/tarnreporting.conf",
    "etc/tarnreporting/tarnreportingd.toml",
    "lib/tarnkit/traceanalysis.so", "share/doc/tarnkit/LICENSE", "share/doc/tarnkit/README.md",
    "share/doc/tarnkit/operations.md", "share/doc/tarnkit/wire.md",
    "lib/python3/dist-packages/tarnreporting/__init__.py", "lib/python3/dist-packages/tarnreporting/messages.py",
)
# All of them: what isn't here is nobody else's.
HEADERS = {"include/tarnkit/" + name for name in ("Options.h", "Reply.h", "Requests.h", "TarnReportingClient.h",
                                                  "Value.h")} | {
    "include/tarnreporting" + ending for ending in (".h", ".hpp", "_messages.h", "_messages.hpp", "_reports.h",
                                                    "_reports.hpp")}
LIBRARIES = ("libtarn_client.a", "libtarn_wire.a", "libtarn_plist.a", "cmake/tarnkit/tarnkit-config.cmake",
             "cmake/tarnkit/tarnkit-config-version.cmake", "libtarnreporting.so.1",
             "cmake/tarnreporting/tarnreporting-config.cmake", "pkgconfig/tarnreporting.pc")

options = argparse.Namespace()


def run(*command):
    return subprocess.run(command, capture_output=True, text=True, stdin=subprocess.DEVNULL)


class InstalledTree(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.mkdtemp(prefix="tarn installed ")
        cls.addClassCleanup(shutil.rmtree, cls.folder)
        cls.prefix = os.path.join(cls.folder, "prefix")
        done = run("cmake", "--install", options.build, "--prefix", cls.prefix)
        assert done.returncode == 0, done.stdout + done.stderr

    def at(self, *parts):
        return os.path.join(self.prefix, *parts)

    def test_every_file_is_in_its_place(self):
        for path in [*FILES, *(f"{options.libdir}/{name}" for name in LIBRARIES)]:
            with self.subTest(path):
                self.assertTrue(os.path.getsize(self.at(path)) > 0)

    def test_no_header_but_the_public_ones_is_installed(self):
        found = {os.path.relpath(os.path.join(folder, name), self.prefix)
                 for folder, _, names in os.walk(self.prefix) for name in names
                 if folder.startswith(self.at("include")) or name.endswith((".h", ".hpp"))}
        self.assertEqual(found, HEADERS)

    def test_the_programs_start_and_tell_their_help(self):
        for name in PROGRAMS:
            with self.subTest(name):
                done = run(self.at("bin", name), "--help")
                self.assertEqual(done.returncode, 0, done.stderr)
                self.assertIn("--socket", done.stdout)

    def test_the_service_takes_the_example_configuration(self):
        # It gets past the configuration and fails at a state directory that can't be one.
        done = run(self.at("bin", "tarnreportingd"), "--config", self.at("etc/tarnreporting/tarnreportingd.toml"),
                   "--state-dir", os.path.join(self.prefix, "etc/tarnreporting/tarnreportingd.toml/none"),
                   "--socket", os.path.join(self.folder, "none.sock"))
        self.assertEqual(done.returncode, 1, done.stderr)

    def test_every_shown_key_of_the_example_configuration_has_its_default(self):
        with open(self.at("etc/tarnreporting/tarnreportingd.toml"), encoding="utf-8") as file:
            lines = file.read().splitlines()
        keys = [line[1:] for line in lines if line.startswith("#") and not line.startswith("# ") and "=" in line]
        self.assertEqual(len(keys), 35)  # all but the one that is set
        shown = os.path.join(self.folder, "shown.toml")
        with open(shown, "w", encoding="utf-8") as file:
            file.write("\n".join(line[1:] if line[1:] in keys else line for line in lines) + "\n")
        done = run(self.at("bin", "tarnreportingd"), "--config", shown, "--state-dir", shown + "/none",
                   "--socket", os.path.join(self.folder, "none.sock"))
        self.assertEqual(done.returncode, 1, done.stderr)

    @unittest.skipUnless(shutil.which("journalctl"), "journalctl is missing")
    def test_the_journal_takes_the_catalogue(self):
        with tempfile.TemporaryDirectory() as root:
            folder = os.path.join(root, "usr/lib/systemd/catalog")
            os.makedirs(folder)
            os.makedirs(os.path.join(root, "var/lib/systemd/catalog"))
            shutil.copy(self.at("lib/systemd/catalog/tarnreporting.catalog"), folder)
            update = run("journalctl", "--root", root, "--update-catalog")
            self.assertEqual((update.returncode, update.stderr), (0, ""))
            told = run("journalctl", "--root", root, "--list-catalog").stdout.splitlines()
        self.assertEqual(len(told), 9)
        for line in told:
            self.assertRegex(line, r"^[0-9a-f]{32} tarnreporting: .+$")

    def test_the_units_name_what_the_service_needs(self):
        service = self.settings("lib/systemd/system/tarnreportingd.service")
        self.assertEqual(service["Type"], ["notify"])
        self.assertEqual(service["StateDirectory"], ["tarnreporting"])
        self.assertRegex(service["WatchdogSec"][0], r"^[1-9][0-9]*s$")
        program, *arguments = shlex.split(service["ExecStart"][0])
        self.assertEqual((os.path.isabs(program), os.path.basename(program)), (True, "tarnreportingd"))
        self.assertNotIn("@", " ".join(arguments))
        sockets = self.settings("lib/systemd/system/tarnreportingd.socket")
        self.assertEqual((sockets["ListenStream"], sockets["SocketMode"]), (["/run/tarnreporting/socket"], ["0660"]))
        # The user that both name is the one that the snippet makes.
        with open(self.at("lib/sysusers.d/tarnreporting.conf"), encoding="utf-8") as file:
            self.assertIn("u " + service["User"][0] + " ", file.read())
        self.assertEqual(sockets["SocketUser"], service["User"])
        # Root's alone, and known to the service by its name.
        admin = self.settings("lib/systemd/system/tarnreportingd-admin.socket")
        self.assertEqual((admin["ListenStream"], admin["SocketMode"], admin["SocketUser"], admin["FileDescriptorName"]),
                         (["/run/tarnreporting/socket-admin"], ["0600"], ["root"], ["admin"]))
        self.assertEqual(admin["Service"], ["tarnreportingd.service"])
        self.assertEqual(service["Sockets"], ["tarnreportingd.socket tarnreportingd-admin.socket"])

    def adapter_settings(self, name):
        """Of its unit, which comes with it; none where the adapter isn't there."""
        program, unit = self.at("bin", name), f"lib/systemd/user/{name}.service"
        self.assertEqual(os.path.exists(self.at(unit)), os.path.exists(program))
        if not os.path.exists(program):
            return None
        done = run(program, "--help")
        self.assertEqual((done.returncode, "--print" in done.stdout), (0, True), done.stderr)
        settings = self.settings(unit)
        self.assertEqual(shlex.split(settings["ExecStart"][0]), [program])
        self.assertEqual(settings["Documentation"], [f"man:{name}(1)"])
        return settings

    def test_the_adapter_for_pipewire_comes_and_goes_with_it_or_is_not_there_at_all(self):
        if settings := self.adapter_settings("tarnreporting-pipewire"):
            self.assertEqual((settings["BindsTo"], settings["WantedBy"]), (["pipewire.service"], ["pipewire.service"]))

    def test_the_adapter_for_alsa_is_always_there(self):
        self.assertEqual(self.adapter_settings("tarnreporting-alsa")["WantedBy"], ["default.target"])

    def test_the_program_that_exports_is_there_with_its_unit_or_not_at_all(self):
        program, unit = self.at("bin/tarnreporting-export"), "lib/systemd/system/tarnreporting-export.service"
        example = self.at("etc/tarnreporting/export.toml")
        self.assertEqual([os.path.exists(path) for path in (self.at(unit), example)], 2 * [os.path.exists(program)])
        if not os.path.exists(program):
            return
        settings = self.settings(unit)
        self.assertEqual(shlex.split(settings["ExecStart"][0]), [program])
        with open(self.at("lib/sysusers.d/tarnreporting-export.conf"), encoding="utf-8") as file:
            self.assertIn("u " + settings["User"][0] + " ", file.read())
        self.assertEqual(run(program).returncode, 0)  # nothing leaves by default
        with open(example, encoding="utf-8") as file:
            lines = file.read().splitlines()
        keys = [line[1:] for line in lines if line.startswith("#") and not line.startswith("# ") and " = " in line]
        self.assertEqual(len(keys), 19)
        shown = os.path.join(self.folder, "export.toml")
        with open(shown, "w", encoding="utf-8") as file:
            file.write("\n".join(line[1:] if line[1:] in keys else line for line in lines) + "\n")
        done = run(program, "--config", shown)
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        if shutil.which("systemd-analyze"):
            done = run("systemd-analyze", "verify", "--man=no", self.at(unit))
            told = [line for line in done.stderr.splitlines() if "tarnreporting-export" in line]
            self.assertEqual(told, [])

    def test_the_program_that_collects_is_there_with_its_unit_or_not_at_all(self):
        program, unit = self.at("bin/tarnreporting-collect"), "lib/systemd/system/tarnreporting-collect.service"
        example = self.at("etc/tarnreporting/collect.toml")
        self.assertEqual([os.path.exists(path) for path in (self.at(unit), example)], 2 * [os.path.exists(program)])
        if not os.path.exists(program):
            return
        settings = self.settings(unit)
        self.assertEqual(shlex.split(settings["ExecStart"][0]), [program])
        with open(self.at("lib/sysusers.d/tarnreporting-collect.conf"), encoding="utf-8") as file:
            self.assertIn("u " + settings["User"][0] + " ", file.read())
        with open(example, encoding="utf-8") as file:
            lines = file.read().splitlines()
        keys = [line[1:] for line in lines if line.startswith("#") and not line.startswith("# ") and " = " in line]
        self.assertEqual(len(keys), 14)
        shown = os.path.join(self.folder, "collect.toml")
        with open(shown, "w", encoding="utf-8") as file:
            file.write("\n".join(line[1:] if line[1:] in keys else line for line in lines).replace(
                '"dbname=tarnreporting"', f'"host={self.folder} dbname=tarnreporting"') + "\n")
        done = run(program, "--config", shown, "--migrate")
        self.assertEqual(done.returncode, 1, done.stderr)
        self.assertTrue(done.stderr.startswith("tarnreporting-collect: database: "), done.stderr)
        if shutil.which("systemd-analyze"):
            done = run("systemd-analyze", "verify", "--man=no", self.at(unit))
            told = [line for line in done.stderr.splitlines() if "tarnreporting-collect" in line]
            self.assertEqual(told, [])

    def test_the_program_that_asks_is_there_with_it_and_found_beside_the_tool(self):
        program = self.at("bin/tarnreporting-fleet")
        if not os.path.exists(program):
            self.assertFalse(os.path.exists(self.at("bin/tarnreporting-collect")))
            return
        done = run(self.at("bin/tarnreportingctl"), "fleet", "top", "--db", f"host='{self.folder}'")
        self.assertEqual(done.returncode, 69, done.stderr)
        self.assertTrue(done.stderr.startswith("tarnreporting-fleet: database: "), done.stderr)

    def test_the_installed_configuration_is_read_and_may_be_absent(self):
        path = self.at("etc/tarnreporting/tarnreportingd.toml")
        command = [self.at("bin", "tarnreportingd"), "--state-dir", path + "/none",
                   "--socket", os.path.join(self.folder, "none.sock")]
        with open(path, encoding="utf-8") as file:
            shown = file.read()
        try:
            with open(path, "w", encoding="utf-8") as file:
                file.write("[nothing]\n")
            done = run(*command)
            self.assertEqual((done.returncode, path in done.stderr), (78, True), done.stderr)
            os.remove(path)
            self.assertEqual(run(*command[:1], "--state-dir", self.at("bin/tarnreportingd/none"),
                                 *command[3:]).returncode, 1)
        finally:
            with open(path, "w", encoding="utf-8") as file:
                file.write(shown)

    def test_the_unit_has_its_bounds(self):
        service = self.settings("lib/systemd/system/tarnreportingd.service")
        for bound in ("MemoryMax", "TasksMax", "LimitNOFILE"):
            self.assertRegex(service[bound][0], r"^[1-9][0-9]*[MG]?$")
        self.assertEqual(service["UMask"], ["0027"])

    @unittest.skipUnless(shutil.which("systemd-analyze"), "systemd-analyze is not installed here")
    def test_the_manager_has_nothing_to_say_about_the_units(self):
        units = [self.at("lib/systemd/system/tarnreportingd" + kind)
                 for kind in (".service", ".socket", "-admin.socket")]
        done = run("systemd-analyze", "verify", "--man=no", *units)
        self.assertEqual((done.returncode, done.stdout, done.stderr), (0, "", ""))

    @unittest.skipUnless(shutil.which("systemd-analyze"), "systemd-analyze is not installed here")
    def test_the_service_is_exposed_as_little_as_it_can_be(self):
        done = run("systemd-analyze", "security", "--offline=true", "--threshold=7", "--no-pager",
                   self.at("lib/systemd/system/tarnreportingd.service"))
        self.assertEqual(done.returncode, 0, done.stdout)

    def test_a_users_own_service_is_where_that_users_clients_look(self):
        sockets = self.settings("lib/systemd/user/tarnreportingd.socket")
        self.assertEqual((sockets["ListenStream"], sockets["SocketMode"]), (["%t/tarnreporting.sock"], ["0600"]))
        admin = self.settings("lib/systemd/user/tarnreportingd-admin.socket")
        self.assertEqual((admin["ListenStream"], admin["SocketMode"], admin["FileDescriptorName"]),
                         (["%t/tarnreporting.sock-admin"], ["0600"], ["admin"]))
        service = self.settings("lib/systemd/user/tarnreportingd.service")
        self.assertEqual(shlex.split(service["ExecStart"][0]),
                         [self.at("bin/tarnreportingd"), "--log-target", "journal"])
        system = self.settings("lib/systemd/system/tarnreportingd.service")
        for same in ("Type", "WatchdogSec", "Restart", "SuccessExitStatus", "RestartPreventExitStatus",
                     "TimeoutStopSec", "Sockets"):
            self.assertEqual(service[same], system[same], same)

    def test_programs_tell_their_version_and_which_build_they_are(self):
        for name in PROGRAMS:
            with self.subTest(name):
                notes = run("readelf", "--notes", self.at("bin", name)).stdout
                build = re.search(r"Build ID: ([0-9a-f]+)", notes)[1]
                told = run(self.at("bin", name), "--version").stdout
                self.assertRegex(told, rf"^{name} [0-9.]+ \((commit [0-9a-f]{{12}}, )?build {build}\)\n$")

    def settings(self, path):
        found = {}
        with open(self.at(path), encoding="utf-8") as file:
            for line in file.read().splitlines():
                if line and line[0] not in "#[":
                    key, value = line.split("=", 1)
                    found.setdefault(key, []).append(value)
        return found

    def test_a_stranger_builds_against_the_client_library(self):
        build = os.path.join(self.folder, "consumer")
        done = run("cmake", "-S", options.consumer, "-B", build, "-G", "Ninja", f"-DCMAKE_PREFIX_PATH={self.prefix}",
                   f"-DCMAKE_CXX_COMPILER={options.compiler}")
        self.assertEqual(done.returncode, 0, done.stdout + done.stderr)
        done = run("cmake", "--build", build)
        self.assertEqual(done.returncode, 0, done.stdout + done.stderr)
        absent = os.path.join(self.folder, "absent.sock")
        done = run(os.path.join(build, "consumer"), absent)
        self.assertEqual(done.returncode, 0, done.stdout + done.stderr)
        self.assertIn(absent, done.stdout)


# Where the configuration of a prefix lies.
CONFIGURATIONS = {"/usr": "/etc", "/usr/local": "/usr/local/etc", "/opt/x": "/etc/opt/x"}


class StagedPackage(unittest.TestCase):
    """Under each prefix that a package may have: everything is in its place, and the unit's own command line serves."""

    def test_the_unit_of_every_prefix_starts_a_service(self):
        for prefix, configuration in CONFIGURATIONS.items():
            with self.subTest(prefix), tempfile.TemporaryDirectory(prefix="tarnstage") as stage:
                done = subprocess.run(["cmake", "--install", options.build, "--prefix", prefix], capture_output=True,
                                      text=True, env={**os.environ, "DESTDIR": stage}, stdin=subprocess.DEVNULL)
                self.assertEqual(done.returncode, 0, done.stdout + done.stderr)
                self.assertTrue(os.path.isfile(f"{stage}{configuration}/tarnreporting/tarnreportingd.toml"))
                self.serve(stage, prefix)

    def serve(self, stage, prefix):
        unit = f"{stage}{prefix}/lib/systemd/system/tarnreportingd.service"
        with open(unit, encoding="utf-8") as file:
            command = shlex.split(next(line for line in file if line.startswith("ExecStart=")).split("=", 1)[1])
        self.assertEqual(command[0], f"{prefix}/bin/tarnreportingd")
        path = stage + "/socket"
        with socket.socket(socket.AF_UNIX) as listener:
            listener.bind(path)
            listener.listen()
            words = [word.replace("%S", stage) for word in command]
            words[0] = stage + words[0]

            def hand_over():  # as the service manager does
                os.dup2(listener.fileno(), 3)

            service = subprocess.Popen(["sh", "-c", 'export LISTEN_FDS=1 LISTEN_PID=$$; exec "$@"', "sh", *words],
                                       stdin=subprocess.DEVNULL, stderr=subprocess.PIPE, text=True,
                                       preexec_fn=hand_over, pass_fds=(3,))
        try:
            ctl = stage + prefix + "/bin/tarnreportingctl"
            done = run(ctl, "--socket", path, "--wait=20", "status")
            self.assertEqual(done.returncode, 0, done.stdout + done.stderr)
            self.assertIn("the service is up at " + path, done.stdout)
        finally:
            service.terminate()
            _, said = service.communicate(timeout=30)
        self.assertEqual(service.returncode, 0, said)
        self.assertTrue(os.path.isfile(stage + "/tarnreporting/recorder.sqlite3"))


if __name__ == "__main__":
    parser = argparse.ArgumentParser()
    for name in ("build", "consumer", "compiler", "libdir"):
        parser.add_argument("--" + name, required=True)
    options, rest = parser.parse_known_args()
    unittest.main(argv=[sys.argv[0], *rest])
