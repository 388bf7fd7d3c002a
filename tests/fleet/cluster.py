# SPDX-License-Identifier: Apache-2.0
"""Three NATS servers that keep one stream together, each on a private directory; any of them may be killed."""

import json
import os
import time
import urllib.error
import urllib.request

import nats

PATIENCE = 60
# For this long a message may be known that isn't there: its id was taken down by who lost the lead then.
REPEATS_NANOSECONDS = 20_000_000_000
ANSWER_SECONDS = 2  # a server that has no leader to ask says nothing


class Cluster:
    def __init__(self, folder, size=3):
        ports = [nats.free_port() for _ in range(size)]
        self.looks = [nats.free_port() for _ in range(size)]
        routes = ", ".join(f"nats://127.0.0.1:{port}" for port in ports)
        # Clients know the servers that they were told, and not behind a proxy's back those that there are.
        self.servers = [nats.Server(os.path.join(folder, f"server{number}"), f"""server_name: server{number}
http: "127.0.0.1:{self.looks[number]}"
cluster {{ name: fleet, listen: "127.0.0.1:{port}", routes: [{routes}], no_advertise: true }}""")
                        for number, port in enumerate(ports)]

    @property
    def urls(self):
        return ",".join(server.url for server in self.servers)

    def start(self, **stream):
        """With its stream; by then all of them have what is in it."""
        for server in self.servers:
            server.launch()
        self.until(lambda: self.try_to_make(stream), "make a stream")
        self.until(self.is_whole, "keep one stream together")

    def try_to_make(self, options):
        options = {"num_replicas": len(self.servers), "duplicate_window": REPEATS_NANOSECONDS, **options}
        try:
            self.use(lambda client: client.make_stream(**options))
        except RuntimeError:  # not all know of each other yet
            return False
        return True

    def end(self):
        for server in self.servers:
            server.end()

    @staticmethod
    def until(holds, what):
        until = time.monotonic() + PATIENCE
        while time.monotonic() < until:
            try:
                if holds():
                    return
            except OSError:
                pass
            time.sleep(0.1)
        raise RuntimeError(f"the servers don't {what}")

    def use(self, question):
        """What one of the servers that live answers; OSError when none does."""
        problem = OSError("no server lives")
        for server in self.servers:
            if server.process is None or server.process.poll() is not None:
                continue
            try:
                with server.client(ANSWER_SECONDS) as client:
                    return question(client)
            except OSError as error:
                problem = error
        raise problem

    def of_stream(self):
        return self.use(lambda client: client.ask("$JS.API.STREAM.INFO.TARNREPORTING"))

    def leader(self):
        """The number of the server that leads the stream."""
        name = self.of_stream()["cluster"].get("leader")
        return next((number for number in range(len(self.servers)) if name == f"server{number}"), None)

    def is_well(self, number):
        """Whether a server lives and has what the others have, as it says itself."""
        try:
            with urllib.request.urlopen(f"http://127.0.0.1:{self.looks[number]}/healthz", timeout=ANSWER_SECONDS) as told:
                return json.load(told)["status"] == "ok"
        except urllib.error.HTTPError:  # it does not
            return False

    def is_whole(self):
        """Whether all have what is in the stream; only then one of them can be spared."""
        return all(self.is_well(number) for number in range(len(self.servers))) and self.has_all_replicas()

    def has_all_replicas(self):
        try:
            about = self.of_stream()["cluster"]
        except RuntimeError:  # none leads
            return False
        replicas = about.get("replicas", [])
        return bool(about.get("leader")) and len(replicas) == len(self.servers) - 1 and all(
            each["current"] and not each.get("offline") for each in replicas)
