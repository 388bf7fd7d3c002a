#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Writes the property-list files beside it, each in both formats, with the standard library's own writer.

The C++ test that reads them states what they hold.
"""

import datetime
import pathlib
import plistlib

HERE = pathlib.Path(__file__).parent

SAMPLES = {
    "kinds": {
        "true": True,
        "false": False,
        "integers": [0, 1, -1, 127, 128, 255, 256, 65535, 65536, 2**31, 2**32, 2**63 - 1, -(2**63), 2**63, 2**64 - 1],
        "reals": [0.0, -0.5, 0.1, 1e300, 2.5],
        "date": datetime.datetime(2026, 11, 20, 10, 0, 0),
        "early": datetime.datetime(1969, 7, 20, 20, 17, 40),
        "data": bytes(range(256)),
        "no data": b"",
        "text": "plain",
        "no text": "",
        "marks": "<&>\"'\t\n",
        "letters": "\u00e9\u20ac\U0001f50a",
        "\u00fcber": {"empty": {}, "none": []},
    },
    "probes": [
        {"name": "messages", "children": [{"name": "inner"}]},
        {"name": "starts"},
    ],
    "long": [f"item {number}" for number in range(300)],
    "root_text": "a text alone",
}


def main():
    for name, value in SAMPLES.items():
        for kind, form in (("xml", plistlib.FMT_XML), ("binary", plistlib.FMT_BINARY)):
            (HERE / f"{name}.{kind}.plist").write_bytes(plistlib.dumps(value, fmt=form, sort_keys=False))
    (HERE / "uid.binary.plist").write_bytes(plistlib.dumps([plistlib.UID(5), plistlib.UID(70000)],
                                                           fmt=plistlib.FMT_BINARY))


if __name__ == "__main__":
    main()
