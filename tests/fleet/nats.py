# SPDX-License-Identifier: Apache-2.0
"""A NATS server with JetStream on a private directory, and as much of its protocol as the tests need to ask it."""

import json
import os
import shutil
import signal
import socket
import subprocess
import time

PROGRAM = shutil.which("nats-server") or shutil.which("nats-server", path="/usr/sbin:/usr/bin:/usr/local/bin")
PATIENCE = 20


def free_port():
    with socket.socket() as probe:
        probe.bind(("127.0.0.1", 0))
        return probe.getsockname()[1]


class Server:
    """Started and killed as often as a test likes; it keeps its port and its directory."""

    def __init__(self, folder, extra="", tls=None, login=None):
        self.port, self.process, self.tls, self.login = free_port(), None, tls, login
        os.makedirs(folder, exist_ok=True)
        self.configuration = os.path.join(folder, "nats.conf")
        self.log = os.path.join(folder, "nats.log")
        with open(self.configuration, "w", encoding="utf-8") as file:
            file.write(f"listen: 127.0.0.1:{self.port}\njetstream {{ store_dir: \"{folder}/jetstream\" }}\n{extra}\n")

    @property
    def url(self):
        return f"nats://127.0.0.1:{self.port}"

    def launch(self):
        with open(self.log, "ab") as log:
            self.process = subprocess.Popen([PROGRAM, "-c", self.configuration], stdout=log, stderr=log)

    def start(self):
        self.launch()
        until = time.monotonic() + PATIENCE
        while time.monotonic() < until:
            try:
                with self.client() as client:
                    client.ask("$JS.API.INFO")
                    return
            except OSError:
                time.sleep(0.05)
        raise RuntimeError("nats-server doesn't answer")

    def client(self, patience=5):
        return Client(self.port, self.tls, patience, self.login)

    def end(self, how=signal.SIGKILL):
        if self.process and self.process.poll() is None:
            self.process.send_signal(how)
            self.process.wait()


class Client:
    """One connection; a question at a time. `login` makes of the server's INFO what is said to it beside the rest."""

    def __init__(self, port, tls=None, patience=5, login=None):
        self.socket = socket.create_connection(("127.0.0.1", port), timeout=patience)
        self.input = None
        try:
            self.greet(tls, login)
        except OSError:
            self.close()
            raise

    def greet(self, tls, login):
        info = b""
        while not info.endswith(b"\n"):  # what comes after it may be TLS
            byte = self.socket.recv(1)
            if not byte:
                raise OSError("the server is gone")
            info += byte
        if tls:
            self.socket = tls.wrap_socket(self.socket, server_hostname="localhost")
        self.input = self.socket.makefile("rb")
        about = {"verbose": False, "headers": True, **(login(json.loads(info.partition(b" ")[2])) if login else {})}
        self.socket.sendall(f"CONNECT {json.dumps(about)}\r\nSUB answer 1\r\nPING\r\n".encode())
        self.line(b"PONG")

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.close()

    def close(self):
        if self.input:
            self.input.close()
        self.socket.close()

    def line(self, first):
        while True:
            line = self.input.readline()
            if not line:
                raise OSError("the server is gone")
            if line.startswith(b"PING"):
                self.socket.sendall(b"PONG\r\n")
            if line.startswith(first):
                return line

    def ask(self, subject, question=None):
        body = b"" if question is None else json.dumps(question).encode()
        self.socket.sendall(f"PUB {subject} answer {len(body)}\r\n".encode() + body + b"\r\n")
        size = int(self.line(b"MSG").split()[-1])
        answer = json.loads(self.input.read(size + 2))
        if "error" in answer:
            raise RuntimeError(f"{subject}: {answer['error']}")
        return answer

    def make_stream(self, name="TARNREPORTING", subject="tarnreporting.>", **options):
        return self.ask(f"$JS.API.STREAM.CREATE.{name}",
                        {"name": name, "subjects": [subject], "storage": "file", "retention": "limits",
                         "max_consumers": -1, "max_msgs": -1, "max_bytes": -1, "max_age": 0, "num_replicas": 1,
                         "discard": "new", "duplicate_window": 120_000_000_000, **options})

    def change_stream(self, name="TARNREPORTING", **options):
        configuration = self.ask(f"$JS.API.STREAM.INFO.{name}")["config"]
        return self.ask(f"$JS.API.STREAM.UPDATE.{name}", {**configuration, **options})

    def messages(self, name="TARNREPORTING"):
        return self.ask(f"$JS.API.STREAM.INFO.{name}")["state"]["messages"]

    def all_messages(self, name="TARNREPORTING"):
        """(headers as text, bytes) of each, in their order."""
        count, found = self.messages(name), []
        question = json.dumps({"stream_name": name, "config": {
            "deliver_subject": "deliver", "deliver_policy": "all", "ack_policy": "none", "replay_policy": "instant",
            "num_replicas": 1, "mem_storage": True}}).encode()
        self.socket.sendall(b"SUB deliver 2\r\nPUB $JS.API.CONSUMER.CREATE.%s answer %d\r\n%s\r\n"
                            % (name.encode(), len(question), question))
        while len(found) < count:
            words = self.line((b"MSG", b"HMSG")).split()
            data = self.input.read(int(words[-1]) + 2)[:-2]
            if words[1] == b"answer":
                if "error" in (answer := json.loads(data)):
                    raise RuntimeError(f"{name}: {answer['error']}")
                continue
            head = int(words[-2]) if words[0] == b"HMSG" else 0
            found.append((data[:head].decode(), data[head:]))
        return found

    def message(self, sequence, name="TARNREPORTING"):
        """(headers as text, bytes) of a message."""
        import base64
        found = self.ask(f"$JS.API.STREAM.MSG.GET.{name}", {"seq": sequence})["message"]
        return base64.b64decode(found.get("hdrs", "")).decode(), base64.b64decode(found["data"])
