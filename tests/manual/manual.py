# SPDX-License-Identifier: Apache-2.0
"""Manual pages and completions against the programs: the kept table of options is theirs, every option and command of
it stands in its page, scdoc takes each page, and the completions offer what comes next.

usage: manual.py SOURCE COMMANDS
"""

import glob
import os
import re
import shutil
import subprocess
import sys
import tempfile
import unittest

SOURCE, COMMANDS = sys.argv[1:3] if len(sys.argv) >= 3 else ("", "")
sys.path.insert(0, os.path.join(SOURCE, "tools", "manual"))

import completions  # noqa: E402
import pages  # noqa: E402

TABLE = os.path.join(SOURCE, "docs", "manual", "commands.json")


def templates():
    return sorted(glob.glob(os.path.join(SOURCE, "docs", "manual", "*.md")))


def every(program):
    return [command for _, command in completions.commands_with_paths(program)]


def run(*command, given=None):
    return subprocess.run(command, input=given, capture_output=True, text=True, timeout=30, check=False,
                          env={"PATH": os.environ["PATH"], "LC_ALL": "C.UTF-8"})


class Table(unittest.TestCase):
    def test_it_is_what_the_programs_parse_with(self):
        told = run(COMMANDS)
        self.assertEqual(told.returncode, 0, told.stderr)
        with open(TABLE, encoding="utf-8") as file:
            self.assertEqual(file.read(), told.stdout, "write it anew: build/bin/tarnreportingcommands > " + TABLE)

    def test_it_has_all_programs_with_their_options(self):
        programs = pages.commands()
        self.assertEqual(sorted(programs),
                         ["tarnreporting-alsa", "tarnreporting-collect", "tarnreporting-export",
                          "tarnreporting-fleet", "tarnreporting-pipewire", "tarnreportingctl", "tarnreportingd"])
        self.assertGreater(len(programs["tarnreportingctl"]["commands"]), 10)
        self.assertIn("--state-dir", completions.names(programs["tarnreportingd"]))


class Pages(unittest.TestCase):
    def test_there_is_one_for_each_thing_that_somebody_looks_up(self):
        self.assertEqual([os.path.basename(path)[:-3] for path in templates()], [
            "libtarnreporting.3", "tarnreporting-alsa.1", "tarnreporting-collect.1", "tarnreporting-export.1",
            "tarnreporting-fleet.1", "tarnreporting-pipewire.1", "tarnreporting-schema.5", "tarnreporting-wire.7",
            "tarnreporting.7", "tarnreportingctl.1", "tarnreportingd.8", "tarnreportingd.toml.5"])

    def test_every_option_and_every_command_stands_in_the_page_of_its_program(self):
        for name in pages.commands():
            section = 8 if name == "tarnreportingd" else 1
            text = pages.scdoc(pages.expanded(os.path.join(SOURCE, "docs", "manual", f"{name}.{section}.md")))
            for command in every(pages.commands()[name]):
                self.assertIn(command["name"], text)
                for option in command["options"]:
                    for word in option["names"] or [option["positional"]]:
                        self.assertIn("*" + word, text)
                        self.assertIn(pages.inline(option["text"]), text)

    def test_every_setting_stands_in_the_page_of_the_configuration(self):
        text = pages.scdoc(pages.expanded(os.path.join(SOURCE, "docs", "manual", "tarnreportingd.toml.5.md")))
        with open(os.path.join(SOURCE, "host", "settings", "HostConfiguration.cpp"), encoding="utf-8") as file:
            settings = re.findall(r'setting\(\s*"(\w+)", "(\w+)",', file.read())
        self.assertGreater(len(settings), 20)
        for section, key in settings:
            self.assertIn(pages.inline(f"`[{section}] {key}`"), text)

    @unittest.skipUnless(shutil.which("scdoc"), "scdoc is not installed here")
    def test_scdoc_takes_each_of_them(self):
        for template in templates():
            with self.subTest(template):
                done = run("scdoc", given=pages.scdoc(pages.expanded(template)))
                self.assertEqual((done.returncode, done.stderr), (0, ""))
                self.assertIn(".SH NAME", done.stdout)

    def test_marks_of_a_document_become_those_of_a_page(self):
        page = pages.scdoc("""# name(7): what

## A `part`

See [this](that.md), `a_b` and c_d.

- one
  goes on
- two

1. first

    code \\
      two
""")
        self.assertEqual(page, """name(7) "" "tarnkit"

# NAME

name - what

# A PART

See this, *a\\_b* and c\\_d.

- one goes on
- two

. first

```
code \\\\
  two
```
""")

    def test_tables_become_lists_of_terms(self):
        def shown(*lines):
            return pages.table(list(lines)).split("\n\n")

        self.assertEqual(shown("| a | b |", "|-|-|", "| `k` | v \\| w |"), ["*k*\n\tv | w"])
        self.assertEqual(shown("| a | b | c | | d | e |", "|-|-|-|-|-|-|", "| 1 | 2 | 3 | | 4 | |"),
                         ["1\n\tb: 2; c: 3", "4"])
        self.assertEqual(shown("| n | | m | |", "|-|-|-|-|", "| 0 | x | 1 | y |", "| | | 2 | z |"),
                         ["n 0\n\tx", "m 1\n\ty", "m 2\n\tz"])

    def test_a_section_that_is_not_there_is_told(self):
        with self.assertRaisesRegex(SystemExit, 'operations.md has no section "Nothing"'):
            pages.section("operations.md", "Nothing")


class Completions(unittest.TestCase):
    def offered(self, *words):
        """What bash offers for the last word."""
        script = completions.bash(pages.commands()[words[0]]) + (
            f"COMP_WORDS=({' '.join(completions.quoted(word) for word in words)})\nCOMP_CWORD={len(words) - 1}\n"
            f"_{words[0]}\nprintf '%s\\n' \"${{COMPREPLY[@]}}\"\n")
        with tempfile.TemporaryDirectory() as folder:
            os.mkdir(os.path.join(folder, "inner"))
            with open(os.path.join(folder, "script.jsonl"), "w", encoding="utf-8"):
                pass
            done = subprocess.run(["bash", "-c", script], capture_output=True, text=True, cwd=folder, check=False)
        self.assertEqual(done.stderr, "")
        return done.stdout.split()

    def test_bash_offers_commands_options_choices_and_files(self):
        self.assertEqual(self.offered("tarnreportingctl", "ex"), ["explain", "export"])
        self.assertEqual(self.offered("tarnreportingctl", "export", "--for"), ["--format"])
        self.assertEqual(self.offered("tarnreportingctl", "export", "--format", "t"), ["trace"])
        self.assertEqual(self.offered("tarnreportingctl", "export", "--sock"), ["--socket"])
        self.assertEqual(self.offered("tarnreportingctl", "defaults", "wr"), ["write"])
        self.assertEqual(self.offered("tarnreportingctl", "run", "s"), ["script.jsonl"])
        self.assertEqual(self.offered("tarnreportingd", "--state-dir", ""), ["inner"])
        self.assertEqual(self.offered("tarnreportingd", "--config", "s"), ["script.jsonl"])

    def test_each_shell_is_told_of_every_option(self):
        for make in (completions.bash, completions.zsh, completions.fish):
            for name, program in pages.commands().items():
                text = make(program)
                for command in every(program):
                    self.assertIn(command["name"], text)
                    for word in completions.names(command):
                        wanted = f"-l {word[2:]}" if make is completions.fish and word[:2] == "--" else word
                        self.assertIn(wanted if make is not completions.fish or word[:2] == "--" else f"-s {word[1:]}",
                                      text, name)

    def test_each_shell_that_is_here_takes_them(self):
        for shell, make in (("bash", completions.bash), ("zsh", completions.zsh), ("fish", completions.fish)):
            if not shutil.which(shell):
                print(f"not looked at: {shell} is not installed here")
                continue
            for program in pages.commands().values():
                done = run(shell, "-n", given=make(program)) if shell != "fish" else run(
                    "fish", "--no-execute", given=make(program))
                self.assertEqual((done.returncode, done.stderr), (0, ""))


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
