# SPDX-License-Identifier: Apache-2.0
"""What a campaign is given: programs, shims, its time, its random numbers, a folder, and where it tells what failed."""

import os
import random
import re
import resource
import time
from collections.abc import Callable
from dataclasses import dataclass, field

from control import Control, shim
from service import Service

# Nothing is removed for want of room: what was recorded stays to be counted.
NOTHING_EXPIRES = "[recorder]\nmax_megabytes = 4096\n"


@dataclass
class Context:
    service_program: str
    shims: str
    folder: str
    seconds: float
    seed: int
    brief: bool = False  # among other tests, on a busy machine: what the clock alone decides is told, but fails nothing
    failures: list = field(default_factory=list)
    services: list = field(default_factory=list)
    begun: float = field(default_factory=time.monotonic)
    folders: int = 0
    only: str = ""  # the part that is asked for; empty: all
    tell_part: Callable = lambda part, figures: None
    failed_before: int = 0

    def __post_init__(self):
        self.random = random.Random(self.seed)

    def left(self):
        return self.seconds - (time.monotonic() - self.begun)

    def share(self):
        """Which of how many shares a part as "2of5" is: (1, 5); no part is all."""
        match = re.fullmatch(r"(\d+)of(\d+)", self.only or "1of1")
        if match is None or not 0 < int(match[1]) <= int(match[2]):
            raise ValueError(f"{self.only!r} is no share as 2of5")
        return int(match[1]) - 1, int(match[2])

    def fail(self, text):
        self.failures.append(text)

    def begin_part(self, whole=False):
        """From here on failures are those of another part, or again of the whole."""
        self.failed_before = 0 if whole else len(self.failures)

    def failures_of_part(self):
        return len(self.failures) - self.failed_before

    def new_folder(self):
        self.folders += 1
        path = os.path.join(self.folder, str(self.folders))
        os.mkdir(path)
        return path

    def new_service(self, configuration=NOTHING_EXPIRES, **options):
        service = Service(self.service_program, self.new_folder(), configuration, **options)
        self.services.append(service)
        return service

    def new_control(self):
        self.folders += 1
        return Control(os.path.join(self.folder, f"control-{self.folders}"))

    def shim(self, name):
        return shim(self.shims, name)

    def end(self):
        for service in self.services:
            service.kill()


def raise_descriptor_limit():
    """As many descriptors as the system lets this program have; many campaigns hold a thousand connections."""
    _, most = resource.getrlimit(resource.RLIMIT_NOFILE)
    resource.setrlimit(resource.RLIMIT_NOFILE, (most, most))
