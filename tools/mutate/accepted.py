# SPDX-License-Identifier: Apache-2.0
"""The survivors that are known, each with its reason, in tests/mutants-accepted.toml:

    [[accepted]]
    file = "TarnReportingSession.cpp"      # without its folder: files move
    line = "if (a < b) {"                  # the whole line without its indentation
    change = "a < b -> a <= b"
    occurrence = 1                         # which one, where the file has several of the same
    reason = "..."
"""

import os
import tomllib


class Accepted:
    def __init__(self, path):
        self.entries = {}
        self.used = set()
        if os.path.exists(path):
            with open(path, "rb") as file:
                for entry in tomllib.load(file).get("accepted", []):
                    if not entry.get("reason", "").strip():
                        raise ValueError(f"{path}: an accepted mutant without a reason: {entry}")
                    key = (entry["file"], entry["line"], entry["change"], entry.get("occurrence", 1))
                    self.entries[key] = entry["reason"]

    def holds(self, mutant):
        key = key_of(mutant)
        if key not in self.entries:
            return False
        self.used.add(key)
        return True

    def stale(self, mutants):
        """What names one of these files and fits no mutant in it any more: the line changed."""
        files = {os.path.basename(mutant.file) for mutant in mutants}
        keys = {key_of(mutant) for mutant in mutants}
        return [key for key in self.entries if key[0] in files and key not in keys]


def key_of(mutant):
    return (os.path.basename(mutant.file), mutant.text, mutant.change(), mutant.occurrence)


def as_entry(mutant):
    """What to put into the file for this mutant, once there is a reason."""
    def quoted(text):
        return '"' + text.replace("\\", "\\\\").replace('"', '\\"') + '"'

    file, line, change, occurrence = key_of(mutant)
    return (f"[[accepted]]\nfile = {quoted(file)}\nline = {quoted(line)}\nchange = {quoted(change)}\n"
            f"occurrence = {occurrence}\nreason = \"\"\n")
