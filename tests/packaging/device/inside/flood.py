# SPDX-License-Identifier: Apache-2.0
"""Writes so many lines into the journal, as fast as it takes them.

usage: flood.py COUNT
"""

import socket
import sys

JOURNAL = "/run/systemd/journal/socket"


def main(count):
    with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as journal:
        journal.connect(JOURNAL)
        for number in range(count):
            journal.send(b"PRIORITY=6\nSYSLOG_IDENTIFIER=flood\nMESSAGE=line %d\n" % number)


if __name__ == "__main__":
    main(int(sys.argv[1]))
