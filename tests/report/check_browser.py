# SPDX-License-Identifier: Apache-2.0
"""Has a real browser show reports, light, dark and on paper, and compares what it shows with SQL.

usage: check_browser.py TARNREPORTINGCTL

Ends with 77, which counts as left out, where chromium isn't installed.
"""

import os
import re
import shutil
import subprocess
import sys
import tempfile

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import comparison  # noqa: E402
import make_store  # noqa: E402
import oracle  # noqa: E402
import page_reader  # noqa: E402
import picture_file  # noqa: E402

LEFT_OUT = 77
# What the pictures of a session with everything in it are painted with. (That of routes is a thin line.)
PAINTS = ("--running", "--output", "--volume", "--overload", "--error", "--issue", "--driver")


class Browser:
    def __init__(self, program, folder):
        self.program, self.folder = program, folder

    def run(self, page, *words):
        done = subprocess.run([self.program, "--headless", "--no-sandbox", "--disable-gpu", "--hide-scrollbars",
                               "--disable-dev-shm-usage", "--no-first-run",
                               "--user-data-dir=" + self.folder + "/profile", *words, "file://" + page],
                              capture_output=True, timeout=120, check=True,
                              env={**os.environ, "HOME": self.folder})
        return done.stdout.decode()

    def tree(self, page):
        return page_reader.read(self.run(page, "--dump-dom"))

    def colours(self, page, *words):
        path = os.path.join(self.folder, "picture.png")
        self.run(page, "--screenshot=" + path, "--window-size=1100,1300", *words)
        return picture_file.colours(path)

    def paper(self, page):
        path = os.path.join(self.folder, "page.pdf")
        self.run(page, "--print-to-pdf=" + path)
        with open(path, "rb") as file:
            return file.read()


def styles(text):
    """The page's two sets of colours: light, dark."""
    parts = re.split(r"@media screen", re.search(r"<style>(.*?)</style>", text, re.DOTALL).group(1))
    return [dict(re.findall(r"(--\w+): (#[0-9a-f]{6})", part)) for part in parts]


def busiest(path):
    """The session with the most faults: it has some of each kind."""
    truth = oracle.Oracle(path)
    kinds = ("overload", "error", "issue")
    session = max(truth.sessions, key=lambda each: sum(truth.count(kind, each) for kind in kinds))
    assert all(truth.count(kind, session) for kind in kinds), session
    return session


def same_numbers(browser, page, path, sessions):
    root = browser.tree(page)
    tables = page_reader.tables(root)
    truth, differences = oracle.Oracle(path), comparison.Differences()
    if "All sessions together" in tables:
        comparison.overview(tables, truth, differences)
        comparison.rows(tables, truth, differences)
    for session in sessions:
        comparison.section(tables, truth, session, differences)
    assert not differences, "\n".join(differences[:10])
    print(f"{len(tables)} tables that the browser shows: as by SQL")


def painted(browser, page, words, own, other):
    """The ground and every lane have the colours of the one set, and of the other set none."""
    found, size = browser.colours(page, *words)
    ground = max(found, key=found.get)
    assert ground in (own["--ground"], own["--panel"]), ground
    missing = [name for name in PAINTS if found.get(own[name], 0) < 10]
    assert not missing, f"not to be seen: {missing}"
    wrong = [name for name in PAINTS if other[name] not in own.values() and found.get(other[name], 0) > 0]
    assert not wrong, f"of the other set: {wrong}"
    print(f"{size[0]} by {size[1]} pixels, {len(found)} colours, ground {own['--ground']}: as the style says")


def main():
    program = shutil.which("chromium")
    if program is None:
        print("left out: chromium isn't installed")
        return LEFT_OUT
    ctl = sys.argv[1]
    with tempfile.TemporaryDirectory() as folder:
        path = os.path.join(folder, "recorder.sqlite3")
        make_store.make(path, make_store.parsed([path, "--hostile", "--seed", "5"]))
        browser = Browser(program, folder)
        session, pages = busiest(path), {}
        for name, words in (("range", ()), ("one", (str(session),))):
            pages[name] = os.path.join(folder, name + ".html")
            subprocess.run([ctl, "--state-dir", folder, "report", "-o", pages[name], *words], check=True, timeout=100)
        with open(pages["one"], encoding="utf-8") as file:
            light, dark = styles(file.read())
        same_numbers(browser, pages["range"], path, [])
        same_numbers(browser, pages["one"], path, [session])
        painted(browser, pages["one"], (), light, dark)
        painted(browser, pages["one"], ("--blink-settings=preferredColorScheme=0",), dark, light)
        paper = browser.paper(pages["one"])
        assert paper.startswith(b"%PDF-") and len(paper) > 10000, len(paper)
        print(f"on paper: {len(paper)} bytes")
    return 0


if __name__ == "__main__":
    sys.exit(main())
