#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Whether the built program tells its USDT probes, by provider and name.

usage: check_probes.py PROGRAM
"""

import re
import subprocess
import sys

PROBES = {
    "operation_create", "operation_start", "operation_stop", "operation_send", "session_created", "session_started",
    "session_stopping", "session_destroyed", "session_message", "other",
}


def main(program):
    notes = subprocess.run(["readelf", "--notes", program], capture_output=True, text=True, check=True).stdout
    found = re.findall(r"Provider: (\S+)\s+Name: (\S+)\s+Location: .*\s+Arguments: (.+)", notes)
    ours = {name: arguments.split() for provider, name, arguments in found if provider == "tarnkit"}
    if set(ours) != PROBES:
        return f"the probes are {sorted(ours)} and should be {sorted(PROBES)}"
    wrong = [name for name, arguments in ours.items() if len(arguments) != (2 if name == "other" else 1)]
    return f"probes with another number of arguments: {wrong}" if wrong else None


if __name__ == "__main__":
    if len(sys.argv) != 2:
        sys.exit("usage: check_probes.py PROGRAM")
    sys.exit(main(sys.argv[1]))
