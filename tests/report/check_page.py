# SPDX-License-Identifier: Apache-2.0
"""Makes reports of made-up stores and holds them against what a page must be: well-formed XML and valid HTML, small,
alone, accessible; and against SQL: its numbers are those of the file, in the tables and in the pictures.

usage: check_page.py TARNREPORTINGCTL
"""

import os
import re
import subprocess
import sys
import tempfile
import xml.etree.ElementTree

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import comparison  # noqa: E402
import make_store  # noqa: E402
import oracle  # noqa: E402
import page_reader  # noqa: E402

MOST_BYTES = 1 << 20

# Of sessions with so few messages so many have a section in the page of a range.
SMALL = 64
MOST_SMALL = 30


def report(ctl, folder, *words):
    path = os.path.join(folder, "page.html")
    subprocess.run([ctl, "--state-dir", folder, "report", "-o", path, *words], check=True, timeout=100)
    with open(path, encoding="utf-8") as file:
        return file.read()


def strict(text):
    """What two strict parsers find; the second one where it is installed."""
    xml.etree.ElementTree.fromstring(text)
    sys.path.append("/usr/lib/python3/dist-packages")  # Debian's, whichever interpreter this is
    try:
        import html5lib
    except ImportError:
        print("left out: python3-html5lib isn't installed")
        return
    finally:
        sys.path.pop()
    parser = html5lib.HTMLParser(strict=False, namespaceHTMLElements=False)
    parser.parse(text)
    assert not parser.errors, parser.errors[:5]


def alone(text):
    """Nothing from elsewhere, nothing that runs."""
    assert len(text.encode()) <= MOST_BYTES, len(text.encode())
    assert not re.search(r"<script|<link|<iframe|<object|\bsrc=|@import|url\(| on\w+=", text)
    links = set(re.findall(r'href="([^"]*)"', text))
    assert all(link.startswith("#") for link in links), links


def accessible(root):
    ids = [node.attributes["id"] for node in root.all() if "id" in node.attributes]
    assert len(ids) == len(set(ids)), "an id is given twice"
    assert root.first("html").attributes["lang"] == "en"
    assert root.first("title").text()
    for link in root.all("a"):
        assert link.attributes["href"][1:] in ids, link.attributes["href"]
    levels = [int(node.name[1]) for node in root.all() if re.fullmatch("h[1-6]", node.name)]
    assert levels[0] == 1 and levels.count(1) == 1
    assert all(after <= before + 1 for before, after in zip(levels, levels[1:])), levels
    captions = {caption.text() for caption in root.all("caption")}
    pictures = list(root.all("svg"))
    assert pictures
    for picture in pictures:
        title, text = (next(node for node in picture.all() if node.attributes.get("id") == name)
                       for name in picture.attributes["aria-labelledby"].split())
        assert (picture.attributes["role"], title.name, text.name) == ("img", "title", "desc")
        assert title.text() and text.text()
        assert title.text() in captions, f"no table has the numbers of {title.text()}"
    for table in root.all("table"):
        assert all(cell.attributes.get("scope") in ("col", "row") for cell in table.all("th"))


def luminance(colour):
    parts = [int(colour[place:place + 2], 16) / 255 for place in (1, 3, 5)]
    parts = [part / 12.92 if part <= 0.04045 else ((part + 0.055) / 1.055) ** 2.4 for part in parts]
    return 0.2126 * parts[0] + 0.7152 * parts[1] + 0.0722 * parts[2]


def contrast(first, second):
    light, dark = sorted((luminance(first), luminance(second)), reverse=True)
    return (light + 0.05) / (dark + 0.05)


def readable(text):
    """Both sets of colours: texts 4.5 to 1, what is drawn 3 to 1, on the ground and on panels."""
    style = re.search(r"<style>(.*?)</style>", text, re.DOTALL).group(1)
    sets = [dict(re.findall(r"(--\w+): (#[0-9a-f]{6})", part)) for part in re.split(r"@media screen", style)]
    assert len(sets) == 2 and sets[0].keys() == sets[1].keys() and len(sets[0]) == 16, sets
    assert "@media print" in style
    for colours in sets:
        for ground in ("--ground", "--panel"):
            for name, colour in colours.items():
                least = {"--ground": 0, "--panel": 0, "--rule": 0, "--text": 4.5, "--quiet": 4.5,
                         "--link": 4.5}.get(name, 3)
                assert contrast(colour, colours[ground]) >= least, (name, ground, contrast(colour, colours[ground]))


def lengths(root, tables, differences):
    """Bars are as long as their numbers say."""
    for figure in root.all("figure"):
        columns = {"applications": 2, "worst": None}.get(figure.attributes["id"])
        if figure.attributes["id"].endswith("-segments"):
            columns = 1
        if columns is None:
            continue
        numbers = [row[columns] for row in tables[figure.first("title").text()]]
        widths = [float(box.attributes["width"]) for box in figure.all("rect")]
        differences.same(f"bars of {figure.attributes['id']}", len(widths), len(numbers))
        for width, number in zip(widths, numbers):
            differences.same(f"a bar of {figure.attributes['id']}", width, max(widths) * number / max(numbers),
                             0.02 + max(widths) * 0.001 / max(numbers))  # numbers are rounded


def columns(root, tables, differences):
    """So are columns."""
    for name, place in (("Active hours a day", 3), ("Overloads an hour", 4), ("Volume", 1)):
        figure = next(node for node in root.all("figure") if node.first("title").text() == name)
        numbers = [row[place] for row in tables[name]]
        heights = [float(box.attributes["height"]) for box in figure.all("rect")]
        differences.same(f"columns of {name}", len(heights), len(numbers))
        for height, number in zip(heights, numbers):
            highest = max(numbers) or 1
            differences.same(f"a column of {name}", height, max(heights) * number / highest,
                             0.02 + max(heights) * 0.001 / highest)


def with_sections(tables):
    """Which sessions of a range have a section: the worst, then the newest small ones. SQL holds the numbers."""
    chosen = [row[0] for row in tables["The worst sessions"]]
    small = [row[0] for row in tables["All sessions, the newest first"] if row[6] <= SMALL and row[0] not in chosen]
    return chosen + small[:MOST_SMALL]


def check(text, path, sessions=None, **bounds):
    strict(text)
    alone(text)
    readable(text)
    root = page_reader.read(text)
    accessible(root)
    tables = page_reader.tables(root)
    made = re.search(r"Made at ([-0-9]+ [:0-9]+)(\.\d{3})\.", text)
    now = comparison.moment(made.group(1)) + float(made.group(2))
    truth, whole = oracle.Oracle(path, now=now, **bounds), oracle.Oracle(path, now=now)
    differences = comparison.Differences()
    written = [int(node.attributes["id"][8:]) for node in root.all("section")
               if re.fullmatch(r"session-\d+", node.attributes["id"])]
    if sessions is None:
        comparison.overview(tables, truth, differences)
        comparison.rows(tables, truth, differences)
        columns(root, tables, differences)
        assert written == with_sections(tables), written
    else:
        assert written == sessions, written
    for session in written:
        comparison.section(tables, whole, session, differences)
    lengths(root, tables, differences)
    assert not differences, "\n".join(differences[:10])
    print(f"{len(truth.sessions)} sessions, {len(truth.messages)} messages, {len(written)} sections, "
          f"{len(text.encode())} bytes: as by SQL")


def stores():
    """Options of the stores to look at: a fixed seed and a fresh one."""
    asked = os.environ.get("TARN_TEST_SEED")
    for seed in ([int(asked)] if asked else [1, int.from_bytes(os.urandom(4), "little")]):
        print(f"seed {seed}, to repeat: TARN_TEST_SEED={seed}", flush=True)
        yield ["--seed", str(seed)]
        yield ["--seed", str(seed), "--hostile", "--open", "--sessions", "60", "--events", "9000", "--days", "2"]


def main():
    ctl = sys.argv[1]
    for options in stores():
        with tempfile.TemporaryDirectory() as folder:
            path = os.path.join(folder, "recorder.sqlite3")
            arguments = make_store.parsed([path, *options])
            make_store.make(path, arguments)
            check(report(ctl, folder), path)
            check(report(ctl, folder, "7"), path, [7])
            since = make_store.END - arguments.days * 86400 / 2
            until = make_store.END - arguments.days * 86400 / 4
            check(report(ctl, folder, "--since", f"@{since}", "--until", f"@{until}"), path, since=since, until=until)


if __name__ == "__main__":
    main()
