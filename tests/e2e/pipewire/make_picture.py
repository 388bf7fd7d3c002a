# SPDX-License-Identifier: Apache-2.0
"""Makes the picture of a real run that stands in the documents: players and a recorder on a PipeWire of its own, one of
them moved to a headset and made louder, and the report of its session, shown by a browser.

usage: make_picture.py BUILD PICTURE.png
"""

import os
import shutil
import signal
import subprocess
import sys
import time

from headless import Machine, eventually, need

WIDTH, HEIGHT = 820, 1150


def play(machine):
    """For half a minute or so, as somebody would."""
    music = machine.play("music", 24, "--volume", "0.125", role="Music")
    recorder = machine.spawn("pw-record", "--media-role", "Communication", "-P",
                             '{ node.name = "call" application.id = "org.test.call" }',
                             os.path.join(machine.folder, "call.wav"))
    time.sleep(5)
    short = [machine.play("messenger", 1, role="Notification")]
    machine.set_props("music", "{ channelVolumes: [ 0.421875, 0.421875 ], volume: 1.0 }")
    time.sleep(4)
    short.append(machine.play("game", 8, role="Game"))
    machine.tool("pw-metadata", str(machine.node("music")["id"]), "target.object", "headset")
    time.sleep(4)
    short.append(machine.play("messenger", 1, role="Notification"))
    machine.set_props("music", "{ mute: true }")
    time.sleep(2)
    machine.set_props("music", "{ mute: false }")
    machine.finish(music, *short)
    machine.end(recorder, signal.SIGINT)
    need(eventually(lambda: len(machine.sessions()) >= 5 and all(row["ended"] for row in machine.sessions())))
    return machine.sessions("music")[0]["id"]


def main(build, picture):
    if shutil.which("chromium") is None:
        raise SystemExit("chromium isn't installed")
    programs = [os.path.join(os.path.abspath(build), "bin", name)
                for name in ("tarnreportingd", "tarnreportingctl", "tarnreporting-pipewire")]
    machine = Machine(True, programs)
    try:
        machine.start()
        music = play(machine)
        page = os.path.join(machine.folder, "report.html")
        answer = machine.ctl("report", "-o", page, str(music))
        need(answer.returncode == 0, answer.stderr)
        subprocess.run(["chromium", "--headless", "--no-sandbox", "--disable-gpu", "--hide-scrollbars",
                        "--no-first-run", "--disable-dev-shm-usage", f"--user-data-dir={machine.folder}/profile",
                        f"--window-size={WIDTH},{HEIGHT}", "--screenshot=" + os.path.abspath(picture),
                        "file://" + page],
                       check=True, env={**os.environ, "HOME": machine.folder}, stderr=subprocess.DEVNULL, timeout=120)
    finally:
        machine.close()
    print(f"{picture}: {os.path.getsize(picture)} bytes")


if __name__ == "__main__":
    if len(sys.argv) != 3:
        raise SystemExit(__doc__)
    main(*sys.argv[1:])
