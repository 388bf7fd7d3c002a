# SPDX-License-Identifier: Apache-2.0
"""What befalls a fleet while it works: servers, collectors and exporters are killed, each now and then."""

import random
import threading
import time
import traceback


class Trouble(threading.Thread):
    """Comes again and again, about so many seconds apart, until end()."""

    def __init__(self, act, seconds, seed):
        super().__init__(daemon=True)
        self.act, self.seconds, self.random = act, seconds, random.Random(seed)
        self.stopping, self.count, self.problem = threading.Event(), 0, ""
        self.start()

    def run(self):
        while not self.stopping.wait(self.seconds * self.random.uniform(0.5, 1.5)):
            try:
                self.act(self.random)
            except Exception:  # whoever ends it is told
                self.problem = traceback.format_exc()
                return
            self.count += 1

    def end(self):
        """How often it came."""
        self.stopping.set()
        self.join()
        if self.problem:
            raise RuntimeError(self.problem)
        return self.count


def kill_a_server(cluster, dice):
    """And start it again; the next one only when all have all again, as one of three may be gone and not two."""
    server = dice.choice(cluster.servers)
    server.end()
    time.sleep(dice.uniform(0.2, 2))
    server.launch()
    cluster.until(cluster.is_whole, "come together again")


def kill_an_exporter(exporters, dice):
    exporter = dice.choice(exporters)
    exporter.kill()
    exporter.start()


class Killings:
    """All of them at once. `seconds`: how far apart those of servers, of collectors and of exporters are."""

    def __init__(self, cluster, collectors, exporters, seconds, seed):
        acts = {"server": lambda dice: kill_a_server(cluster, dice),
                "collector": collectors.kill_one,
                "exporter": lambda dice: kill_an_exporter(exporters, dice)}
        self.troubles = {name: Trouble(act, each, f"{seed} {name}") for (name, act), each in zip(acts.items(), seconds)}

    def end(self):
        """How many there were, by what was killed."""
        for trouble in self.troubles.values():
            trouble.stopping.set()
        return {f"{name}_kills": trouble.end() for name, trouble in self.troubles.items()}
