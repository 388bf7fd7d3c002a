# SPDX-License-Identifier: Apache-2.0
"""Runs the shell blocks of every manual page as they stand: those of the programs' help texts too.

usage: examples.py SOURCE BUILD
"""

import glob
import os
import subprocess
import sys
import tempfile


def main(source, build):
    tool = os.path.join(source, "tools", "manual", "pages.py")
    with tempfile.TemporaryDirectory(prefix="tarnpages") as folder:
        pages = []
        for template in sorted(glob.glob(os.path.join(source, "docs", "manual", "*.md"))):
            with open(template, encoding="utf-8") as file:
                if "<!-- document:" in file.read():
                    continue  # a document of docs/, whose blocks are run there
            pages.append(os.path.join(folder, os.path.basename(template)))
            with open(pages[-1], "w", encoding="utf-8") as file:
                subprocess.run([sys.executable, "-B", tool, "markdown", template], stdout=file, check=True)
        runner = os.path.join(source, "tests", "docs", "shell_blocks.py")
        return subprocess.run([sys.executable, "-B", runner, build, *pages], check=False).returncode


if __name__ == "__main__":
    if len(sys.argv) != 3:
        raise SystemExit(__doc__)
    sys.exit(main(*sys.argv[1:]))
