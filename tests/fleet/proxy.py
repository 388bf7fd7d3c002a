# SPDX-License-Identifier: Apache-2.0
"""A proxy before a NATS server that refuses some of what is published, loses some of the acknowledgements and hands
others over in another order. It is a thread; all of its connections share the shares and the count."""

import json
import random
import selectors
import socket
import threading
from dataclasses import dataclass, field

REFUSAL = json.dumps({"type": "io.nats.jetstream.api.v1.pub_ack_response",
                      "error": {"code": 503, "err_code": 10077, "description": "refused on the way"}}).encode()
# What a server says that was about to propose a message when it lost the lead: it knows the name, and has no message.
KNOWN = json.dumps({"stream": "TARNREPORTING", "seq": 0, "duplicate": True}).encode()


@dataclass
class Pair:
    """A client and its server; what of each hasn't been a whole line or message yet."""
    client: socket.socket
    server: socket.socket
    from_client: bytearray = field(default_factory=bytearray)
    from_server: bytearray = field(default_factory=bytearray)
    inbox: bytes = b""  # the number of the client's subscription for answers
    held: bytes = b""  # an acknowledgement that lets the next one go first


class Proxy:
    def __init__(self, server_port, seed, refused=0.0, lost=0.0, reordered=0.0, known=0.0):
        self.known = known
        self.server_port, self.refused, self.lost, self.reordered = server_port, refused, lost, reordered
        self.random = random.Random(seed)
        self.counts = {"published": 0, "refused": 0, "lost": 0, "reordered": 0, "known": 0}
        self.listener = socket.create_server(("127.0.0.1", 0), backlog=256)
        self.port = self.listener.getsockname()[1]
        self.selector = selectors.DefaultSelector()
        self.selector.register(self.listener, selectors.EVENT_READ, None)
        self.wake, self.woken = socket.socketpair()
        self.selector.register(self.woken, selectors.EVENT_READ, "end")
        self.thread = threading.Thread(target=self.work, daemon=True)
        self.thread.start()

    def close(self):
        self.wake.send(b"x")
        self.thread.join()
        for key in list(self.selector.get_map().values()):
            key.fileobj.close()
        self.wake.close()
        self.selector.close()

    def work(self):
        while True:
            for key, _ in self.selector.select():
                if key.data == "end":
                    return
                if key.data is None:
                    self.accept()
                elif key.fileobj.fileno() >= 0:
                    self.carry(key.fileobj, key.data)

    def accept(self):
        client, _ = self.listener.accept()
        try:
            server = socket.create_connection(("127.0.0.1", self.server_port), timeout=5)
        except OSError:
            client.close()
            return
        pair = Pair(client, server)
        for each in (client, server):
            each.settimeout(5)
            self.selector.register(each, selectors.EVENT_READ, pair)

    def end(self, pair):
        for each in (pair.client, pair.server):
            self.selector.unregister(each)
            each.close()

    def carry(self, source, pair):
        try:
            data = source.recv(262144)
            if not data:
                self.end(pair)
            elif source is pair.client:
                pair.from_client += data
                self.carry_up(pair)
            else:
                pair.from_server += data
                self.carry_down(pair)
        except OSError:
            self.end(pair)

    @staticmethod
    def take(buffer, sized):
        """The next operation's line and all of it; nothing until it is whole. `sized`: those that have a payload."""
        end = buffer.find(b"\r\n")
        if end < 0:
            return None, None
        line, whole = bytes(buffer[:end]), end + 2
        if line.split(b" ", 1)[0].upper() in sized:
            whole += int(line.split()[-1]) + 2
        if len(buffer) < whole:
            return None, None
        taken = bytes(buffer[:whole])
        del buffer[:whole]
        return line, taken

    def carry_up(self, pair):
        up, down = bytearray(), bytearray()
        while True:
            line, whole = self.take(pair.from_client, (b"PUB", b"HPUB"))
            if whole is None:
                break
            words = line.split()
            if words[0] == b"SUB" and words[1].startswith(b"_INBOX"):
                pair.inbox = words[-1]
            if words[0] == b"HPUB" and len(words) == 5 and not words[1].startswith(b"$JS"):
                self.counts["published"] += 1
                answer = self.answer_instead()
                if answer:
                    down += b"MSG %s %s %d\r\n%s\r\n" % (words[2], pair.inbox, len(answer), answer)
                    continue
            up += whole
        pair.server.sendall(up)
        pair.client.sendall(down)

    def answer_instead(self):
        """What is said of a message that is kept back; nothing where it goes on."""
        for name, share, answer in (("refused", self.refused, REFUSAL), ("known", self.known, KNOWN)):
            if share and self.random.random() < share:
                self.counts[name] += 1
                return answer
        return b""

    def carry_down(self, pair):
        down = bytearray()
        while True:
            line, whole = self.take(pair.from_server, (b"MSG", b"HMSG"))
            if whole is None:
                break
            if line.startswith(b"MSG _INBOX"):
                if self.random.random() < self.lost:
                    self.counts["lost"] += 1
                    continue
                if not pair.held and self.random.random() < self.reordered:
                    self.counts["reordered"] += 1
                    pair.held = whole
                    continue
                down += whole + pair.held
                pair.held = b""
            else:
                down += whole
        pair.client.sendall(down)
