# SPDX-License-Identifier: Apache-2.0
"""Real tarnreporting-collect side by side, between a cluster and a database."""

import os
import re
import signal
import subprocess
import time

CONSUMER = "$JS.API.CONSUMER.INFO.TARNREPORTING.collect"


class Collectors:
    def __init__(self, program, folder, urls, database):
        self.running = []
        self.log = os.path.join(folder, "collect.log")
        configuration = os.path.join(folder, "collect.toml")
        with open(configuration, "w", encoding="utf-8") as file:
            # What a killed one held is to come soon.
            file.write(f"[server]\nurls = \"{urls}\"\nanswer_seconds = 5\nagain_seconds = 2\n"
                       f"[database]\nurl = \"{database}\"\n")
        self.command = [program, "--config", configuration, "--log-level", "debug"]

    def start(self):
        with open(self.log, "ab") as log:
            self.running.append(subprocess.Popen(self.command, stderr=log))

    def migrate(self):
        subprocess.run([*self.command, "--migrate"], check=True, stderr=subprocess.DEVNULL)

    def kill_one(self, dice):
        victim = self.running.pop(dice.randrange(len(self.running)))
        victim.kill()
        victim.wait()
        self.start()

    def end(self, how=signal.SIGTERM):
        """Their exit statuses."""
        for each in self.running:
            each.send_signal(how)
        return [each.wait() for each in self.running]

    def asked_again(self):
        """Ids that devices were asked for again, those of which they were asked twice counted twice."""
        return sum(int(count) for count in re.findall(r"asked for (\d+) ids again", self.logged()))

    def logged(self):
        with open(self.log, encoding="utf-8") as file:
            return file.read()


def drained(cluster, patience):
    """Waits until all of the stream was acknowledged. Whether it was; 0 (0) may be what a new leader says at first."""
    until, times = time.monotonic() + patience, 0
    while time.monotonic() < until:
        try:
            state = cluster.use(lambda client: client.ask(CONSUMER))
            behind = cluster.of_stream()["state"]["last_seq"] - state["ack_floor"]["stream_seq"]
            times = times + 1 if (state["num_pending"], state["num_ack_pending"], behind) == (0, 0, 0) else 0
        except (OSError, RuntimeError):
            times = 0
        if times == 3:
            return True
        time.sleep(0.2)
    return False
