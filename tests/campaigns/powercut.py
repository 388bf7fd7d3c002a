# SPDX-License-Identifier: Apache-2.0
"""What a power cut leaves: everything that was written but not yet synchronised may be there, in part or not at all.

The service runs with a journal of its writes (shim/WriteJournal.cpp) while clients send. From the journal the state
directory is built as a cut at a random moment could have left it, and the service starts on that: what was known to be
committed before the cut is there, nothing comes twice, and no healthy database is set aside. Names of files are taken
to be kept in order, as a journalling file system does; pages written through a mapping are lost.
"""

import os
import struct
import time
from dataclasses import dataclass, field

import control
from account import FIRST, begin_session, judge, message_parts, rows_after
from service import settled

HEADER = struct.Struct("<IIQQ")
MADE, WRITTEN, CUT, SYNCHRONISED, REMOVED, RENAMED = range(1, 7)
SECTOR = 4096
CUTS_A_RUN = 30
KEY = 1


def read_journal(path):
    """[(deed, path, place, data)]."""
    with open(path, "rb") as file:
        data = file.read()
    entries, at = [], 0
    while at + HEADER.size <= len(data):
        deed, path_bytes, place, data_bytes = HEADER.unpack_from(data, at)
        at += HEADER.size
        if at + path_bytes + data_bytes > len(data):
            break  # the kill came while it was written
        name = data[at:at + path_bytes].decode()
        entries.append((deed, name, place, data[at + path_bytes:at + path_bytes + data_bytes]))
        at += path_bytes + data_bytes
    return entries


@dataclass
class Disk:
    """One file: what is safe, and what was done since."""

    safe: bytearray = field(default_factory=bytearray)
    pending: list = field(default_factory=list)

    def synchronise(self):
        for deed in self.pending:
            apply(self.safe, *deed)
        self.pending.clear()

    def after_cut(self, random, share):
        """The content with each pending sector kept by chance: all for 1, none for 0."""
        content = bytearray(self.safe)
        for deed, place, data in self.pending:
            if deed == CUT:
                if random.random() < share:
                    apply(content, deed, place, data)
                continue
            for offset in range(0, len(data), SECTOR):
                if random.random() < share:
                    apply(content, deed, place + offset, data[offset:offset + SECTOR])
        return content


def apply(content, deed, place, data):
    if deed == CUT:
        del content[place:]
        content.extend(bytes(place - len(content)))
        return
    if len(content) < place:
        content.extend(bytes(place - len(content)))
    content[place:place + len(data)] = data


def disks_after(entries):
    """The files by their paths as they are known after these entries."""
    disks = {}
    for deed, path, place, data in entries:
        if deed == MADE:
            disks.setdefault(path, Disk())
        elif deed in (WRITTEN, CUT) and path in disks:
            disks[path].pending.append((deed, place, data))
        elif deed == SYNCHRONISED and path in disks:
            disks[path].synchronise()
        elif deed == REMOVED:
            disks.pop(path, None)
        elif deed == RENAMED and path in disks:
            disks[data.decode()] = disks.pop(path)
    return disks


def build(disks, folder, random):
    share = random.choice((0.0, 0.0, 0.5, 0.9, 1.0))
    for path, disk in disks.items():
        target = os.path.join(folder, path)
        os.makedirs(os.path.dirname(target), exist_ok=True)
        with open(target, "wb") as file:
            file.write(disk.after_cut(random, share))


class Recording:
    """One run under the journal; `known` holds (journal entries so far, number that was committed by then)."""

    class Sent:
        def __init__(self):
            self.key, self.next = KEY, FIRST
            self.answers, self.refused, self.settled = [], set(), FIRST - 1

    def __init__(self, context, seconds):
        self.sent, self.known = self.Sent(), []
        service = context.new_service()
        # The root is known before anything is made below it.
        os.makedirs(service.state)
        page = context.new_control()
        journal = os.path.join(service.folder, "journal")
        environment = {**page.environment(context.shim("journal")), "TARN_SHIM_ROOT": service.state,
                       "TARN_SHIM_JOURNAL": journal}
        if not service.start(environment):
            raise RuntimeError(f"the service doesn't start: {service.log_text()[-500:]}")
        self.load(service, page, context.random, seconds)
        service.kill()
        self.entries = read_journal(journal)

    def load(self, service, page, random, seconds):
        deadline = time.monotonic() + seconds
        parts = message_parts(KEY)
        with service.connect() as client:
            begin_session(client, KEY)
            while time.monotonic() < deadline:
                count = random.choice((1, 20, 400))
                numbers = range(self.sent.next, self.sent.next + count)
                self.sent.next += count
                client.send_bytes(b"".join(struct.pack(">I", number).join(parts) for number in numbers))
                for number in numbers:
                    client.reply(number)
                if random.random() < 0.7:
                    settled(client)
                    self.known.append((page[control.SEQUENCE], numbers[-1]))

    def known_at(self, cut):
        return max((number for entries, number in self.known if entries <= cut), default=FIRST - 1)


def run(context, figures):
    figures.update(cuts=0, runs=0, entries=0, committed_lost=0, doubled=0, set_aside=0, refused=0)
    while context.left() > 0:
        recording = Recording(context, min(1.5, max(0.5, context.seconds / 8)))
        figures["runs"] += 1
        figures["entries"] += len(recording.entries)
        if not recording.known:
            raise RuntimeError("nothing was committed while it was recorded")
        for _ in range(CUTS_A_RUN):
            if context.left() <= 0:
                break
            one_cut(context, figures, recording)


def one_cut(context, figures, recording):
    cut = context.random.randint(1, len(recording.entries))
    service = context.new_service()
    os.makedirs(service.state)
    build(disks_after(recording.entries[:cut]), service.state, context.random)
    figures["cuts"] += 1
    where = f"cut after entry {cut} of {len(recording.entries)}"
    if not service.start():
        figures["refused"] += 1
        context.fail(f"{where}: the start ended with {service.process.returncode}: {service.log_text()[-300:]}")
        return
    reader = service.reader()
    rows = [(client, number) for _, client, number in rows_after(reader, 0)]
    reader.close()
    status = service.stop()
    recording.sent.settled = recording.known_at(cut)
    verdict = judge(rows, [recording.sent])
    for name, keys in (("committed_lost", verdict.settled_lost), ("doubled", verdict.doubled)):
        figures[name] += len(keys)
        if keys:
            context.fail(f"{where}: {name} {len(keys)} of {len(rows)} rows, the first {keys[:3]}: "
                         f"{service.log_text()[-300:]}")
    if any(".damaged" in name for name in os.listdir(service.state)):
        figures["set_aside"] += 1
        context.fail(f"{where}: the database was set aside: {service.log_text()[-300:]}")
    if status != 0:
        context.fail(f"{where}: status {status} at the end: {service.log_text()[-300:]}")
