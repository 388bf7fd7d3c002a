# SPDX-License-Identifier: Apache-2.0
"""The disk is full, over quota, read-only or broken for a while under load, and then it works again: nothing that was
answered is lost or doubled, and the service goes on by itself.

Full it is truly where a small file system can be mounted, in a name space of the campaign's own; the other faults, and
that one too where it can't, come from the interposed calls.
"""

import os
import time

from account import Sender, judge, rows_after
from smalldisk import SmallDisk, fill

FAULTS = {
    "full": (("pwrite", "truncate"), "ENOSPC"),
    "quota": (("pwrite", "truncate"), "EDQUOT"),
    "readonly": (("pwrite", "truncate", "sync"), "EROFS"),
    "sync": (("sync",), "EIO"),
    "io": (("pwrite", "truncate", "sync"), "EIO"),
}


class Round:
    def __init__(self, context, figures, disk):
        self.context, self.figures, self.disk = context, figures, disk
        self.control = context.new_control()
        self.service = context.new_service(environment=self.control.environment(context.shim("faults")))
        self.mounted = disk.works and context.random.random() < 0.5 and disk.mount(self.service.state)
        self.fault = "filled" if self.mounted else context.random.choice(tuple(FAULTS))

    def begin_fault(self):
        if self.mounted:
            fill(os.path.join(self.service.state, "filler"))
        else:
            self.control.let_all_fail(*FAULTS[self.fault])

    def end_fault(self):
        if self.mounted:
            os.unlink(os.path.join(self.service.state, "filler"))
        else:
            self.control.let_all_work()

    def play(self):
        random = self.context.random
        if not self.service.start():
            raise RuntimeError(f"the service doesn't start: {self.service.log_text()[-500:]}")
        senders = [Sender(self.service.socket, key, window=256) for key in (1, 2, 3)]
        for sender in senders:
            sender.start()
        time.sleep(random.uniform(0.05, 0.2))
        for _ in range(random.randint(1, 2)):
            self.begin_fault()
            time.sleep(random.uniform(0.1, 0.9))
            self.end_fault()
            time.sleep(random.uniform(0.05, 0.2))
        for sender in senders:
            sender.stopping.set()
        for sender in senders:
            sender.join()
        self.look(senders, self.service.stop())

    def look(self, senders, status):
        what = f"round {self.figures['rounds']} ({self.fault})"
        if status != 0:
            self.figures["unclean"] += 1
            self.context.fail(f"{what}: status {status} at the end: {self.service.log_text()[-400:]}")
        for sender in senders:
            if sender.problem is not None:
                self.context.fail(f"{what}: client {sender.key} wasn't served: {sender.problem}")
        reader = self.service.reader()
        verdict = judge([(client, number) for _, client, number in rows_after(reader, 0)], senders)
        reader.close()
        self.figures["answered"] += verdict.answered
        for name, keys in (("lost", verdict.late_lost), ("doubled", verdict.doubled)):
            self.figures[name] += len(keys)
            if keys:
                self.context.fail(f"{what}: {name} {len(keys)} of {verdict.answered}, the first {keys[:3]}: "
                                  f"{self.service.log_text()[-400:]}")
        aside = [name for name in os.listdir(self.service.state) if ".damaged" in name]
        if aside:
            self.context.fail(f"{what}: a healthy store was set aside: {aside}")

    def end(self):
        self.service.kill()
        if self.mounted:
            self.disk.unmount(self.service.state)


def run(context, figures):
    figures.update(rounds=0, answered=0, lost=0, doubled=0, unclean=0)
    disk = SmallDisk()
    figures["mounted"] = 0
    while context.left() > 0:
        one = Round(context, figures, disk)
        figures["rounds"] += 1
        figures["mounted"] += int(one.mounted)
        try:
            one.play()
        finally:
            one.end()
