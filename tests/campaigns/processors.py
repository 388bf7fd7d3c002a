# SPDX-License-Identifier: Apache-2.0
"""Who has the processors: what is measured comes first, what attacks it stands back.

On a machine that others use as well, root puts service and client ahead of all of them; who isn't root measures what
the others leave.
"""

import os

WEIGHTIEST = -20


def come_first(rank=2):
    """In the service, and a rank higher in the polite client, whose own waits would be the service's: each has a
    processor as soon as it has something to do. Threads of one rank take turns of a tenth of a second, which nobody
    has elsewhere; so there is a rank below for the threads of the service that stand back for its first."""
    try:
        os.sched_setscheduler(0, os.SCHED_RR, os.sched_param(rank))
    except PermissionError:
        pass


def stand_back():
    """In an attacker, and in what stands for it: the last processor only, and that only while none of them wants it."""
    os.sched_setaffinity(0, {max(os.sched_getaffinity(0))})
    is_first = os.sched_getscheduler(0) == os.SCHED_RR
    os.sched_setscheduler(0, os.SCHED_OTHER if is_first else os.SCHED_IDLE, os.sched_param(0))
    if is_first:
        os.setpriority(os.PRIO_PROCESS, 0, WEIGHTIEST)  # or there would be no attack beside the others' work
