# SPDX-License-Identifier: Apache-2.0
"""A small file system that can be filled, in a name space of this program's own."""

import ctypes
import os

NEW_MOUNTS, PRIVATE, RECURSIVE, DETACH = 0x20000, 1 << 18, 1 << 14, 2
DISK_BYTES = 96 << 20


class SmallDisk:
    """A file system in memory that only this program and its children see; `works` tells whether it can be had."""

    libc = ctypes.CDLL(None, use_errno=True)

    def __init__(self):
        self.works = (self.libc.unshare(NEW_MOUNTS) == 0
                      and self.libc.mount(None, b"/", None, PRIVATE | RECURSIVE, None) == 0)

    def mount(self, folder, size=DISK_BYTES):
        os.makedirs(folder)
        options = f"size={size}".encode()
        self.works = self.works and self.libc.mount(b"tmpfs", folder.encode(), b"tmpfs", 0, options) == 0
        return self.works

    def unmount(self, folder):
        self.libc.umount2(folder.encode(), DETACH)


def fill(path):
    with open(path, "wb", buffering=0) as file:
        for size in (1 << 20, 4096, 1):
            try:
                while file.write(bytes(size)) == size:
                    pass
            except OSError:
                continue
