# SPDX-License-Identifier: Apache-2.0
"""Pastes every shell block of every document into a shell, as it stands, and looks whether each command succeeds.

A block is a run of lines that are indented by four blanks and begin with a command. Around it is a folder with the
build in it, a service that runs on it and what a session left there; `./dev` finds everything built, and a command that
follows something is interrupted after a moment. A block that can't be run says why, in a comment above it:

    <!-- not run: REASON -->

One that needs a program which isn't installed here is named in the output and passed over.

usage: shell_blocks.py BUILD DOCUMENT...
"""

import os
import re
import shutil
import signal
import subprocess
import sys
import tempfile

SECONDS = 60
COMMANDS = re.compile(r"(?:\./dev|build/bin/\w+|tarnreporting(?:d|ctl)|bpftrace|cmake|cp|jq|kill|mkdir|perf|readelf|"
                      r"sqlite3|systemctl)\b")
MARK = re.compile(r"<!-- not run: (.+) -->")
# What README shows must be there when its commands have run.
EXPECTED = {"README.md": ("sys.oxbow.tarnkit.Playback.Start", "sys.oxbow.longformaudio.Session_Generic.Summary",
                          "createSession", "sys.oxbow.tarnkit.tarnreportingclientuptime")}
DEV = """#!/bin/sh
[ "$1" = build ]
"""
# The installed program's defaults are the machine's; here they are the folder's.
CTL = """#!/bin/bash
for word; do
  [[ $word != --follow ]] || exec timeout --preserve-status -s INT 1 "{ctl}" --state-dir "{folder}" "$@"
done
exec "{ctl}" --state-dir "{folder}" "$@"
"""
# Examples look at session 12.
SCRIPT = "".join("""{"op": "createReportingSession", "reporterID": %d}
{"op": "setServiceType", "serviceType": "longformaudio", "reporterID": %d}
{"op": "startReportingSessionForID", "reporterID": %d}
{"op": "sendMessage", "message": {"issue_type": "overload"}, "category": "IO", "type": "IssueDetector"}
{"op": "stopReportingSessionForID", "reporterID": %d}
""".replace("%d", str(number)) for number in range(31, 43))


def blocks(text):
    """(line, commands, why it isn't run) for each shell block."""
    found, lines, why, start = [], [], None, 0
    inside = False
    for number, line in enumerate(text.splitlines() + [""], 1):
        if line.startswith("```"):
            inside = not inside
        if line.startswith("    ") and not inside:
            start = start or number
            lines.append(line[4:])
            continue
        if lines and COMMANDS.match(lines[0]):
            found.append((start, "\n".join(lines) + "\n", why))
        if mark := MARK.search(line):
            why = mark.group(1)
        elif line.strip():
            why = None
        lines, start = [], 0
    return found


def missing(commands):
    words = re.findall(r"(?:^|\||&&)[ ]*([a-z][\w-]*)", commands, re.MULTILINE)
    return sorted({word for word in words if word in ("jq", "xxd", "protoc", "sqlite3", "readelf", "perf", "bpftrace")
                   and not shutil.which(word)})


def prepare(folder, build):
    os.symlink(build, os.path.join(folder, "build"))
    os.mkdir(os.path.join(folder, "bin"))
    for path, content in (("dev", DEV), ("bin/tarnreportingctl", CTL.format(ctl=build + "/bin/tarnreportingctl",
                                                                             folder=folder))):
        with open(os.path.join(folder, path), "w", encoding="utf-8") as file:
            file.write(content)
        os.chmod(os.path.join(folder, path), 0o755)
    with open(os.path.join(folder, "player.jsonl"), "w", encoding="utf-8") as file:
        file.write(SCRIPT)
    environment = {**os.environ, "TARNREPORTING_SOCKET": folder + "/socket", "HOME": folder, "TMPDIR": folder,
                   "XDG_STATE_HOME": folder + "/home", "PATH": folder + "/bin:" + os.environ["PATH"]}
    service = subprocess.Popen([build + "/bin/tarnreportingd", "--socket", folder + "/socket", "--state-dir", folder],
                               stdin=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
    subprocess.run(["tarnreportingctl", "--wait", "run"], input=SCRIPT, text=True, env=environment, check=True,
                   stdout=subprocess.DEVNULL)
    subprocess.run(["tarnreportingctl", "events", "--settled"], env=environment, check=True, stdout=subprocess.DEVNULL)
    return service, environment


def paste(commands, folder, environment):
    """The exit status and what was printed. What the block left running ends with it."""
    shell = subprocess.Popen(["bash", "-e", "-m", "-o", "pipefail"], stdin=subprocess.PIPE, stdout=subprocess.PIPE,
                             stderr=subprocess.STDOUT, text=True, cwd=folder, env=environment, start_new_session=True)
    try:
        printed, _ = shell.communicate(commands, timeout=SECONDS)
        return shell.returncode, printed
    except subprocess.TimeoutExpired:
        os.killpg(shell.pid, signal.SIGKILL)
        return "none in time", shell.communicate()[0]


def main(build, documents):
    ran, failed = 0, 0
    with tempfile.TemporaryDirectory(prefix="tarndocs") as folder:
        service, environment = prepare(folder, os.path.abspath(build))
        try:
            for document in documents:
                name = os.path.basename(document)
                with open(document, encoding="utf-8") as file:
                    found = blocks(file.read())
                for line, commands, why in found:
                    if not why and (absent := missing(commands)):
                        why = "not installed here: " + ", ".join(absent)
                    if why:
                        print(f"{name}:{line}: not run: {why}")
                        continue
                    status, printed = paste(commands, folder, environment)
                    ran += 1
                    lacks = [text for text in EXPECTED.get(name, ()) if text not in printed]
                    if status != 0 or lacks:
                        failed += 1
                        print(f"{name}:{line}: status {status}, lacks {lacks}\n{commands}---\n{printed}")
        finally:
            service.send_signal(signal.SIGTERM)
            status = service.wait(SECONDS)
    if status != 0:
        raise SystemExit(f"the service ended with status {status}")
    print(f"{ran} blocks ran, {failed} failed")
    if failed or ran < 5:
        raise SystemExit(1)


if __name__ == "__main__":
    if len(sys.argv) < 3:
        raise SystemExit(__doc__)
    main(sys.argv[1], sys.argv[2:])
