# SPDX-License-Identifier: Apache-2.0
"""The campaign's side of the page that it shares with the interposed calls of the service (shim/Control.h)."""

import errno
import mmap
import os
import struct
from collections import Counter

WORDS = 64
(FAULT_KIND, FAULT_ORDINAL, FAULT_ACTION, FIRED, STICKY_KINDS, STICKY_ERROR, FAILING_ALLOCATION, ALLOCATIONS,
 CLOCK_OFFSET, SEQUENCE, SYNC_DELAY, DELAYS, FAULT_SITE, SITE_CALLS, FAILURES_IN_A_ROW) = range(15)
FIRST_COUNTER = 16
SHORT = 65536
COUNT_ONLY = (1 << 64) - 1

# Kinds of calls, in the order of shim/Faults.cpp, and how each may fail.
DISK = ("EIO", "ENOSPC", "EINTR", "EROFS", "EDQUOT")
KINDS = {
    "open": (*DISK, "ENOMEM", "EMFILE"),
    "read": ("EIO", "EINTR", "EAGAIN", "ENOMEM", "short"),
    "pread": ("EIO", "EINTR", "ENOMEM", "short"),
    "write": (*DISK, "EAGAIN", "short"),
    "pwrite": (*DISK, "short"),
    "sync": DISK,
    "truncate": DISK,
    "map": ("ENOMEM", "EAGAIN", "EMFILE"),
    "stat": ("EIO", "EINTR", "ENOMEM"),
    "receive": ("EIO", "EINTR", "EAGAIN", "ENOMEM", "short"),
    "send": ("EIO", "EINTR", "EAGAIN", "ENOMEM", "short"),
    "accept": ("EINTR", "EAGAIN", "ENOMEM", "EMFILE"),
    "wait": ("EINTR", "EAGAIN", "EIO"),
    "watch": ("ENOMEM", "ENOSPC"),
    "rename": (*DISK, "ENOMEM"),
    "remove": ("EIO", "EROFS", "ENOMEM"),
    "folder": (*DISK, "ENOMEM"),
    "lock": ("EIO", "EINTR", "EAGAIN", "ENOMEM"),
    "socket": ("EMFILE", "ENOMEM"),
}
NUMBERS = {kind: number for number, kind in enumerate(KINDS)}
SITES_VARIABLE = "TARN_SHIM_SITES"


class Control:
    """The page; words are read and written as a dictionary's members."""

    def __init__(self, path):
        self.path = path
        with open(path, "w+b") as file:
            file.truncate(WORDS * 8)
            self.page = mmap.mmap(file.fileno(), WORDS * 8)

    def environment(self, shim):
        return {"LD_PRELOAD": shim, "TARN_SHIM_CONTROL": self.path}

    def __getitem__(self, place):
        return struct.unpack_from("<Q", self.page, place * 8)[0]

    def __setitem__(self, place, value):
        struct.pack_into("<Q", self.page, place * 8, value & COUNT_ONLY)

    def forget(self):
        self.page[:] = bytes(WORDS * 8)

    def let_fail(self, kind, ordinal, how):
        self[FAULT_ACTION] = SHORT if how == "short" else getattr(errno, how)
        self[FAULT_ORDINAL] = ordinal
        self[FAULT_KIND] = NUMBERS[kind] + 1

    def let_fail_at(self, kind, site, ordinal, how):
        """The same, counted among the calls from one site."""
        self[FAULT_SITE] = site
        self.let_fail(kind, ordinal, how)

    def let_all_fail(self, kinds, how):
        self[STICKY_ERROR] = getattr(errno, how)
        self[STICKY_KINDS] = sum(1 << NUMBERS[kind] for kind in kinds)

    def let_all_work(self):
        self[STICKY_KINDS] = 0

    def calls(self):
        return {kind: self[FIRST_COUNTER + number] for kind, number in NUMBERS.items()}


def sites_in(path):
    """How many calls of each (kind, site) a program made that was given this file."""
    kinds = list(KINDS)
    with open(path, "rb") as file:
        return Counter((kinds[kind], site) for kind, site in struct.iter_unpack("<QQ", file.read()))


def shim(folder, name):
    path = os.path.join(folder, f"tarn_shim_{name}.so")
    if not os.path.exists(path):
        raise SystemExit(f"campaign: {path} isn't there: build the target tarn_shims")
    return path
