# SPDX-License-Identifier: Apache-2.0
"""SIGKILL at random moments while the store of an older service is brought to the present layout: the file is the old
one or the new one, and every event is there as it was. In full with 10^6 events and 100 kills; SECONDS bound it.
"""

import hashlib
import os
import shutil
import sqlite3
import threading
import time

EVENTS, EVENTS_IN_BRIEF = 1_000_000, 20_000
MOST_KILLS = 100
START_PATIENCE = 300
# As the first recorder laid it out, every payload twice.
VERSION_0 = """
PRAGMA page_size = 8192; PRAGMA auto_vacuum = INCREMENTAL; PRAGMA journal_mode = WAL; PRAGMA synchronous = OFF;
CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT);
WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < {events}) INSERT INTO events SELECT i,
    1750000000.0 + i, 'tally', 'event' || (i % 7),
    '{{"n":' || (i / 2) || ',"text":"' || hex(zeroblob(100)) || '"}}', '{{}}' FROM n;
"""
ALL = "SELECT id, time, backend, name, payload, detail FROM events WHERE id <= ? ORDER BY id"

# The layout that the service of today keeps.
LAYOUT = 2


def digest_of(database, events):
    """How many events there are, and what they say."""
    digest, count = hashlib.blake2b(), 0
    for row in database.execute(ALL, (events,)):
        digest.update(repr(row).encode())
        count += 1
    return count, digest.hexdigest()


class Ground:
    """A state directory with the old store, laid out as often as it was migrated."""

    def __init__(self, context):
        self.events = EVENTS_IN_BRIEF if context.brief else EVENTS
        self.service = context.new_service()
        self.original = os.path.join(context.new_folder(), "recorder.sqlite3")
        database = sqlite3.connect(self.original, isolation_level=None)
        database.executescript(VERSION_0.format(events=self.events))
        self.digest = digest_of(database, self.events)
        database.close()

    def lay_out(self):
        shutil.rmtree(self.service.state, ignore_errors=True)
        os.makedirs(self.service.state)
        shutil.copyfile(self.original, self.service.store)

    def version(self):
        """Of the layout; and whether the events are those that were there."""
        database = sqlite3.connect(f"file:{self.service.store}?mode=ro", uri=True)
        try:
            version = database.execute("PRAGMA user_version").fetchone()[0]
            return version, digest_of(database, self.events) == self.digest
        except sqlite3.Error:
            return None, False
        finally:
            database.close()


def kill_after(service, seconds):
    """Ends the service that is about to start, so long after it began."""
    before = service.process

    def wait_and_kill():
        while service.process is before:
            time.sleep(0.001)
        time.sleep(seconds)
        service.process.kill()

    killer = threading.Thread(target=wait_and_kill)
    killer.start()
    return killer


def migrate_whole(context, figures, ground):
    """Seconds of one that nobody disturbs, from the start until the service is ready."""
    ground.lay_out()
    begun = time.monotonic()
    if not ground.service.start(patience=START_PATIENCE):
        raise RuntimeError(f"the service doesn't start: {ground.service.log_text()[-500:]}")
    took = time.monotonic() - begun
    ground.service.stop(patience=START_PATIENCE)
    look(context, figures, ground, "after one that nobody disturbed", wanted=(LAYOUT,))
    return took


def look(context, figures, ground, when, wanted=(0, LAYOUT)):
    """The layout's version then."""
    version, same = ground.version()
    if version not in wanted or not same:
        figures["lost"] += 1
        context.fail(f"{when}: the layout is {version}, the events are {'' if same else 'not '}as they were")
    return version


def run(context, figures):
    figures.update(events=0, whole_seconds=0.0, kills=0, old_after=0, new_after=0, lost=0, restarts_refused=0)
    ground = Ground(context)
    figures["events"] = ground.events
    figures["whole_seconds"] = migrate_whole(context, figures, ground)
    ground.lay_out()
    while context.left() > 0 and figures["kills"] < MOST_KILLS and not context.failures:
        killer = kill_after(ground.service, context.random.uniform(0, figures["whole_seconds"] * 1.1))
        ground.service.start(patience=START_PATIENCE)
        killer.join()
        ground.service.process.wait()
        figures["kills"] += 1
        if look(context, figures, ground, f"after kill {figures['kills']}") == LAYOUT:
            figures["new_after"] += 1
            ground.lay_out()
        else:
            figures["old_after"] += 1
    if not ground.service.start(patience=START_PATIENCE):
        figures["restarts_refused"] += 1
        context.fail(f"no start after the kills: {ground.service.log_text()[-500:]}")
        return
    ground.service.stop(patience=START_PATIENCE)
    look(context, figures, ground, "in the end", wanted=(LAYOUT,))
