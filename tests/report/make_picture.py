# SPDX-License-Identifier: Apache-2.0
"""Makes the picture of reports that stands in the documents: plays the examples against a service of its own, has the
report of all their sessions and that of the music player's made, and a browser show both beside each other.

usage: make_picture.py BUILD PICTURE.png [--dark]
"""

import glob
import json
import os
import shutil
import signal
import subprocess
import sys
import tempfile

EXAMPLES = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..", "examples")
WIDTH, HEIGHT = 1640, 1560
BOTH = """<!DOCTYPE html><style>body {{ margin: 0; display: flex }} iframe {{ border: 0; width: 820px; height: {0}px }}
</style><iframe src="all.html"></iframe><iframe src="one.html"></iframe>""".format(HEIGHT)


def play(ctl, words):
    """All examples at once, some of them several times, as several programs would."""
    scripts = sorted(glob.glob(os.path.join(EXAMPLES, "*.jsonl")))
    scripts = [script for script in scripts if not script.endswith(".expected.jsonl")]
    players = [subprocess.Popen([ctl, *words, "--wait", "run", script], stdout=subprocess.DEVNULL)
               for turn, script in enumerate(scripts) for _ in range(1 + turn % 3)]
    for player in players:
        if player.wait(60) != 0:
            raise SystemExit("a script wasn't played")


def main(build, picture, *options):
    chromium = shutil.which("chromium")
    if chromium is None:
        raise SystemExit("chromium isn't installed")
    ctl = os.path.join(build, "bin/tarnreportingctl")
    with tempfile.TemporaryDirectory(prefix="tarnpicture") as folder:
        words = ["--socket", folder + "/socket", "--state-dir", folder + "/state"]
        service = subprocess.Popen([os.path.join(build, "bin/tarnreportingd"), *words], stderr=subprocess.DEVNULL)
        try:
            play(ctl, words)
        finally:
            service.send_signal(signal.SIGTERM)
            service.wait(60)
        found = subprocess.run([ctl, *words, "sessions", "--app", "org.example.music", "--json"], text=True, check=True,
                               capture_output=True).stdout.splitlines()
        music = max(map(json.loads, found), key=lambda session: (session["overloads"], session["messages"]))
        for name, sessions in (("all", []), ("one", [str(music["id"])])):
            subprocess.run([ctl, *words, "report", "-o", f"{folder}/{name}.html", *sessions], check=True)
        page = folder + "/both.html"
        with open(page, "w", encoding="utf-8") as file:
            file.write(BOTH)
        subprocess.run([chromium, "--headless", "--no-sandbox", "--disable-gpu", "--hide-scrollbars", "--no-first-run",
                        "--disable-dev-shm-usage", "--user-data-dir=" + folder + "/profile",
                        f"--window-size={WIDTH},{HEIGHT}", "--screenshot=" + os.path.abspath(picture),
                        *(["--blink-settings=preferredColorScheme=0"] if "--dark" in options else []),
                        "file://" + page],
                       check=True, env={**os.environ, "HOME": folder}, stderr=subprocess.DEVNULL, timeout=120)
    print(f"{picture}: {os.path.getsize(picture)} bytes")


if __name__ == "__main__":
    if len(sys.argv) < 3:
        raise SystemExit(__doc__)
    main(*sys.argv[1:])
