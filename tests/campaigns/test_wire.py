# SPDX-License-Identifier: Apache-2.0
"""What the campaigns' own client writes and reads: the bytes of RFC 8949, and replies out of order."""

import socket
import tempfile
import threading
import unittest

import wire


class Cbor(unittest.TestCase):
    # Examples of RFC 8949, appendix A.
    VECTORS = ((0, "00"), (23, "17"), (24, "1818"), (255, "18ff"), (256, "190100"), (65535, "19ffff"),
               (1000000, "1a000f4240"), (18446744073709551615, "1bffffffffffffffff"), (-1, "20"), (-24, "37"),
               (-25, "3818"), (-1000, "3903e7"), (1.1, "fb3ff199999999999a"), (False, "f4"), (True, "f5"), (None, "f6"),
               (b"\x01\x02\x03\x04", "4401020304"), ("", "60"), ("\u00fc", "62c3bc"), ([1, [2, 3]], "8201820203"),
               ({"a": 1, "b": [2, 3]}, "a26161016162820203"), (wire.Date(1363896240.5), "c1fb41d452d9ec200000"))

    def test_writes_the_examples_of_the_standard(self):
        for value, text in self.VECTORS:
            self.assertEqual(wire.encode(value).hex(), text, value)

    def test_reads_what_it_writes(self):
        for value, text in self.VECTORS:
            self.assertEqual(wire.decode(bytes.fromhex(text)), value)

    def test_reads_shorter_floats(self):
        self.assertEqual(wire.decode(bytes.fromhex("f93e00")), 1.5)
        self.assertEqual(wire.decode(bytes.fromhex("fa47c35000")), 100000.0)

    def test_refuses_what_is_no_value(self):
        for text in ("", "18", "1900", "6261", "0000", "9f", "f7", "c200", "1c"):
            with self.assertRaises(wire.WireError, msg=text):
                wire.decode(bytes.fromhex(text))

    def test_refuses_to_write_what_no_property_list_holds(self):
        for value in (1 << 64, -(1 << 64) - 1, object(), {1, 2}):
            with self.assertRaises(wire.WireError):
                wire.encode(value)


class Frames(unittest.TestCase):
    def test_splits_whole_frames_and_keeps_the_rest(self):
        data = wire.frame(b"one") + wire.frame(b"") + wire.frame(b"three")
        self.assertEqual(wire.split(data[:-1]), ([b"one", b""], wire.frame(b"three")[:-1]))
        self.assertEqual(wire.split(data), ([b"one", b"", b"three"], b""))

    def test_writes_the_request_of_the_documents(self):
        self.assertEqual(wire.request(1, wire.CREATE, 42).hex(), "05000000830101182a")


class Answers:
    """A listener that answers each connection with the bytes given, in pieces."""

    def __init__(self, folder, pieces):
        self.path = f"{folder}/socket"
        self.listener = socket.socket(socket.AF_UNIX)
        self.listener.bind(self.path)
        self.listener.listen()
        self.thread = threading.Thread(target=self.serve, args=(pieces,))
        self.thread.start()

    def serve(self, pieces):
        connection, _ = self.listener.accept()
        with connection:
            for piece in pieces:
                connection.recv(1 << 16)
                connection.sendall(piece)

    def close(self):
        self.thread.join()
        self.listener.close()


class Replies(unittest.TestCase):
    def client(self, *pieces):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        answers = Answers(folder.name, pieces)
        self.addCleanup(answers.close)
        client = wire.Client(answers.path, patience=5)
        self.addCleanup(client.close)
        return client

    def test_keeps_replies_that_come_in_another_order(self):
        later = wire.frame(wire.encode([2, None, "second"])) + wire.frame(wire.encode([1, None, "first"]))
        client = self.client(later)
        first, second = client.number + 1, client.number + 2
        client.send_bytes(wire.request(first, wire.STATUS) + wire.request(second, wire.STATUS))
        self.assertEqual(client.reply(first), "first")
        self.assertEqual(client.reply(second), "second")

    def test_tells_an_error_with_its_parts(self):
        client = self.client(wire.frame(wire.encode([1, ["domain", 7, "no"]])))
        with self.assertRaises(wire.Refused) as refused:
            client.call(wire.STATUS)
        self.assertEqual((refused.exception.domain, refused.exception.code), ("domain", 7))

    def test_settles_only_where_the_service_can(self):
        self.assertTrue(self.client(wire.frame(wire.encode([1, None]))).settle())
        self.assertFalse(self.client(wire.frame(wire.encode([1, ["d", wire.UNKNOWN_OPERATION, "?"]]))).settle())

    def test_notices_the_end_of_the_connection(self):
        client = self.client(b"")
        with self.assertRaises(wire.WireError):
            client.call(wire.STATUS)


if __name__ == "__main__":
    unittest.main()
