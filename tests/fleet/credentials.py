# SPDX-License-Identifier: Apache-2.0
"""Who may do what on a NATS server, signed for with Ed25519 by the openssl program: an operator's and an account's
tokens for the server's configuration, and credentials files for users.

Keys are written as NATS does: a kind, the key and a CRC-16 in base 32 (https://docs.nats.io/, "NKeys"); tokens are JSON
Web Tokens whose signature is the issuer's.
"""

import base64
import binascii
import json
import os
import struct
import subprocess
import time

OPERATOR, ACCOUNT, USER, SEED = 14 << 3, 0, 20 << 3, 18 << 3
STREAMS = ("mem_storage", "disk_storage", "streams", "consumer")
NO_LIMIT = dict.fromkeys(("subs", "conn", "leaf", "imports", "exports", "data", "payload", *STREAMS), -1)


def written(head, key):
    body = head + key
    # CRC-16/XMODEM, the low byte first.
    return base64.b32encode(body + struct.pack("<H", binascii.crc_hqx(body, 0))).decode().rstrip("=")


def web(data):
    return base64.urlsafe_b64encode(data).decode().rstrip("=")


class Key:
    def __init__(self, folder, kind, name):
        self.kind, self.file = kind, os.path.join(folder, name + ".key")
        self.openssl("genpkey", "-algorithm", "ed25519", "-out", self.file)
        # The last 32 bytes of either form are the key itself.
        self.secret = self.openssl("pkey", "-in", self.file, "-outform", "DER")[-32:]
        self.public = self.openssl("pkey", "-in", self.file, "-pubout", "-outform", "DER")[-32:]

    @staticmethod
    def openssl(*words):
        return subprocess.run(["openssl", *words], capture_output=True, check=True).stdout

    @property
    def name(self):
        return written(bytes([self.kind]), self.public)

    @property
    def seed(self):
        return written(bytes([SEED | self.kind >> 5, (self.kind & 31) << 3]), self.secret)

    def sign(self, data):
        text = self.file + ".text"
        with open(text, "wb") as file:
            file.write(data)
        return self.openssl("pkeyutl", "-sign", "-rawin", "-inkey", self.file, "-in", text)

    def token(self, subject, **nats):
        claims = {"jti": subject.name, "iat": int(time.time()), "iss": self.name, "sub": subject.name,
                  "name": os.path.basename(subject.file), **nats.pop("claims", {}), "nats": {"version": 2, **nats}}
        head = web(b'{"typ":"JWT","alg":"ed25519-nkey"}')
        body = f"{head}.{web(json.dumps(claims).encode())}"
        return f"{body}.{web(self.sign(body.encode()))}"


class Operator:
    """Of a server with one account in which there are streams."""

    def __init__(self, folder):
        self.folder = folder
        self.key, self.system, self.account = (Key(folder, kind, name) for kind, name in (
            (OPERATOR, "operator"), (ACCOUNT, "system"), (ACCOUNT, "account")))

    def configuration(self):
        limits = {**NO_LIMIT, "wildcards": True}
        of_system = {**limits, **dict.fromkeys(STREAMS, 0)}  # it may have none
        tokens = "\n".join(f"  {account.name}: {self.key.token(account, type='account', limits=each)}"
                           for account, each in ((self.system, of_system), (self.account, limits)))
        return (f"operator: {self.key.token(self.key, type='operator')}\nsystem_account: {self.system.name}\n"
                f"resolver: MEMORY\nresolver_preload: {{\n{tokens}\n}}\n")

    def user(self, name, publishes=(">",), subscribes=(">",), ends=None):
        """(key, token); `ends` in seconds since 1970."""
        key = Key(self.folder, USER, name)
        rights = {"pub": {"allow": list(publishes)}, "sub": {"allow": list(subscribes)}}
        return key, self.account.token(key, type="user", subs=-1, data=-1, payload=-1, **rights,
                                       claims={} if ends is None else {"exp": int(ends)})

    def credentials(self, path, *user, **rights):
        """A file of a user, as tools hand them out."""
        key, token = self.user(*user, **rights)
        with open(path, "w", encoding="utf-8") as file:
            file.write(f"-----BEGIN NATS USER JWT-----\n{token}\n------END NATS USER JWT------\n\n"
                       f"-----BEGIN USER NKEY SEED-----\n{key.seed}\n------END USER NKEY SEED------\n")
        return path


def login_of(user):
    """For nats.Client: what it says of itself to a server whose INFO it read."""
    key, token = user
    return lambda info: {"jwt": token, "sig": web(key.sign(info["nonce"].encode()))}
