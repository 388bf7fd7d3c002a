# SPDX-License-Identifier: Apache-2.0
"""The package where no service answers: what its calls say, refuse and keep."""

import ast
import asyncio
import datetime
import glob
import logging
import os
import shutil
import subprocess
import sys
import threading
import unittest

from support import PACKAGE, PATIENCE, Folder, eventually

import tarnreporting
from tarnreporting import Category, Error, Result, ServiceType, Type


class Alone(Folder):
    def setUp(self):
        super().setUp()
        self.client = tarnreporting.Client(self.socket)
        self.addCleanup(self.client.close, 0)
        self.session = self.client.session(ServiceType.TEST, "org.example.test", {"bluetooth": True, "rate": 48000})

    def refused(self, result, call, *arguments, **more):
        with self.assertRaises(Error) as raised:
            call(*arguments, **more)
        self.assertEqual(raised.exception.result, result)

    def post(self, fields):
        return self.session.post(Category.PLAYBACK, Type.GENERIC, fields)


class Messages(Alone):
    def test_each_kind_of_value_is_posted(self):
        moment = datetime.datetime(2026, 1, 1, tzinfo=datetime.timezone.utc)
        for value in (True, -1, 2**64 - 1, 0.5, "caf\u00e9", moment, Type.STOP):
            with self.subTest(value):
                self.assertTrue(self.post({"key": value}))
        self.assertEqual(self.client.stats().posted, 7)

    def test_what_is_wrong_is_refused_at_the_call(self):
        self.refused(Result.KIND, self.post, {"key": None})
        self.refused(Result.KIND, self.post, {"key": [1]})
        self.refused(Result.KIND, self.post, {"key": 2**64})
        self.refused(Result.TEXT, self.post, {"key": "\ud800"})
        self.refused(Result.TEXT, self.post, {"\ud800": 1})
        self.refused(Result.TEXT, self.post, {"a\0b": 1})
        self.refused(Result.ARGUMENT, self.post, {"": 1})
        self.refused(Result.TOO_LARGE, self.post, {"key": "a" * 1025})
        self.refused(Result.TOO_LARGE, self.post, {"k" * 256: 1})
        self.refused(Result.TOO_LARGE, self.post, {f"key{i}": i for i in range(65)})
        self.refused(Result.ARGUMENT, self.session.post, -1, 0, {})
        self.refused(Result.ARGUMENT, self.session.post, 4, 65536, {})
        self.refused(Result.ARGUMENT, self.session.post, 4, 1, {}, stamp=-1.0)
        self.assertEqual(self.client.stats().posted, 0)

    def test_a_shape_takes_values_of_its_kinds_alone(self):
        shape = self.session.shape(Category.VOLUME, Type.SIMPLE, {"volume": float, "route": str, "step": int})
        self.assertTrue(shape.post(0.5, "Speaker", 3))
        self.assertTrue(shape.post(1, "Speaker", 3, stamp=1.7e9))  # a whole number is a number, too
        self.refused(Result.KIND, shape.post, 0.5, "Speaker")
        self.refused(Result.KIND, shape.post, "0.5", "Speaker", 3)
        self.refused(Result.KIND, shape.post, 0.5, 1, 3)
        self.refused(Result.KIND, shape.post, 0.5, "Speaker", 3.0)
        self.refused(Result.KIND, shape.post, 0.5, "Speaker", True)
        self.refused(Result.KIND, self.session.shape, 4, 1, {"key": bytes})
        self.refused(Result.ARGUMENT, self.session.shape, 4, 1, {"": int})
        self.assertEqual(self.client.stats().posted, 2)

    def test_each_report_is_posted(self):
        session = self.session
        self.assertTrue(all((
            session.output_running(0.5, "Speaker"), session.volume_changed(0.75), session.route_changed("HeadphonesBT"),
            session.output_stopped(), session.input_running("MicrophoneBuiltIn", "opus", 48000),
            session.codec_changed("amr-wb", 16000), session.input_stopped(), session.overload(512, 88231),
            session.error("no device"), session.session_duration(12.5))))
        self.assertEqual(self.client.stats().posted, 10)

    def test_a_full_ring_drops_and_counts(self):
        with tarnreporting.Client(self.socket, ring_bytes=4096) as client:
            session = client.session()
            answers = [session.volume_changed(0.5) for _ in range(200)]
            self.assertEqual((client.stats().posted, client.stats().dropped), (answers.count(True),
                                                                                answers.count(False)))
            self.assertIn(False, answers)
            self.assertEqual(client.close(0), answers.count(True))

    def test_the_bounds_of_a_ring_are_told(self):
        for size in (0, 5000, 2**21, 2**40):
            self.refused(Result.ARGUMENT, tarnreporting.Client, self.socket, ring_bytes=size)


class Lives(Alone):
    def test_what_ended_says_so(self):
        shape = self.session.shape(4, 1, {"key": int})
        with self.session as session:
            self.assertTrue(session.volume_changed(0.5))
        self.refused(Result.CLOSED, session.volume_changed, 0.5)
        self.refused(Result.CLOSED, self.post, {})
        self.refused(Result.CLOSED, shape.post, 1)
        session.end()  # again
        other = self.client.session()
        self.assertEqual(self.client.close(0), 1)
        self.assertEqual(self.client.close(0), 0)
        self.assertTrue(self.client.closed)
        for call in (other.output_stopped, self.client.stats, self.client.flush, self.client.session):
            self.refused(Result.CLOSED, call)
        other.end()

    def test_stats_tell_why_there_is_no_connection(self):
        self.assertTrue(eventually(lambda: self.client.stats().last_error.startswith("no service answers")))
        self.assertFalse(self.client.stats().connected)

    def test_a_flush_and_a_close_keep_their_time(self):
        self.assertTrue(self.client.flush(0))  # nothing was posted
        self.post({})
        self.assertFalse(self.client.flush(0.02))
        self.assertEqual(self.client.close(0.02), 1)

    def test_a_client_may_be_closed_while_another_thread_flushes(self):
        self.post({})
        result = []

        def flush():
            try:
                self.client.flush(PATIENCE)
            except Error as error:
                result.append(error.result)

        thread = threading.Thread(target=flush)
        thread.start()
        self.assertTrue(eventually(lambda: self.client._flushes or result))
        self.client.close(0)
        thread.join(PATIENCE)
        self.assertEqual(result, [Result.CLOSED])

    def test_threads_may_post_end_and_close_at_once(self):
        odd = []

        def run():
            try:
                for i in range(400):
                    with self.client.session() as session:
                        session.volume_changed(i / 400)
                        session.post(4, 1, {"key": i})
            except Error as error:
                odd.append(error.result)

        threads = [threading.Thread(target=run) for _ in range(4)]
        for thread in threads:
            thread.start()
        self.assertTrue(eventually(lambda: self.client.stats().posted > 100))
        self.client.close(0)
        for thread in threads:
            thread.join(PATIENCE)
        self.assertLessEqual(set(odd), {Result.CLOSED, Result.TOO_LARGE})

    def test_tasks_of_asyncio_post_and_run_while_one_flushes(self):
        async def main():
            async with tarnreporting.Client(self.socket) as client:
                session = client.session()
                session.output_stopped()  # there is something to flush, whichever of the two is first
                ran = []

                async def other():
                    ran.append(session.output_stopped())

                flushed, _ = await asyncio.gather(client.flush_async(0.05), other())
                self.assertEqual((flushed, ran, client.stats().posted), (False, [True], 2))
                self.assertEqual(await client.close_async(0), 2)

        asyncio.run(main())

    def test_a_forked_child_has_dead_handles_and_may_open_a_client_of_its_own(self):
        child = os.fork()
        if child == 0:
            status = 1
            try:
                self.session.output_stopped()
            except Error as error:
                with tarnreporting.Client(self.socket) as client:
                    fine = client.session().output_stopped() and client.close(0) == 1
                status = 0 if fine and error.result == Result.FORKED and self.client.close(0) == 0 else 2
            finally:
                os._exit(status)
        self.assertEqual(os.waitpid(child, 0)[1], 0)
        self.assertTrue(self.session.output_stopped())

    def test_what_is_open_when_the_interpreter_ends_is_closed_and_told(self):
        done = self.run_python("""
import logging, os, tarnreporting
logging.basicConfig(format="%(name)s: %(message)s")
tarnreporting.Client(os.environ["SOCKET"]).session().output_stopped()
""")
        self.assertEqual((done.returncode, done.stderr), (0, "tarnreporting: 1 messages were not taken\n"))


class Package(Folder):
    def test_without_the_library_the_constants_are_there_and_a_client_is_not(self):
        done = self.run_python("""
import tarnreporting
print(tarnreporting.Category.PLAYBACK.value)
try:
    tarnreporting.Client()
except tarnreporting.LibraryNotFound as error:
    print(error)
""", TARNREPORTING_LIBRARY=os.path.join(self.folder, "none.so"))
        self.assertEqual(done.returncode, 0, done.stderr)
        self.assertTrue(done.stdout.startswith(f"4\n{self.folder}/none.so: "), done.stdout)

    def test_a_library_that_is_another_one_is_told(self):
        done = self.run_python("import tarnreporting; tarnreporting.Client()", TARNREPORTING_LIBRARY="libc.so.6")
        self.assertIn("LibraryNotFound: libc.so.6: ", done.stderr)

    def test_pip_installs_it_without_a_download(self):
        source = os.path.join(self.folder, "source")
        shutil.copytree(PACKAGE, source, ignore=shutil.ignore_patterns("__pycache__"))
        target = os.path.join(self.folder, "target")
        done = subprocess.run([sys.executable, "-m", "pip", "install", "--quiet", "--no-index", "--no-cache-dir",
                               "--disable-pip-version-check", "--target", target, source], capture_output=True,
                              text=True, stdin=subprocess.DEVNULL, timeout=PATIENCE)
        if "No module named pip" in done.stderr:
            self.skipTest("there is no pip")
        self.assertEqual(done.returncode, 0, done.stderr)
        files = {os.path.basename(path) for path in glob.glob(os.path.join(target, "tarnreporting", "*"))}
        self.assertLessEqual({"__init__.py", "_client.py", "_library.py", "messages.py", "py.typed", "reports.py"},
                             files)
        done = self.run_python("import os, tarnreporting; print(tarnreporting.Client(os.environ['SOCKET']).close(0),"
                               " tarnreporting.__file__)", PYTHONPATH=target)
        self.assertEqual(done.stdout, f"0 {target}/tarnreporting/__init__.py\n", done.stderr)

    def test_it_is_written_for_python_3_9(self):
        for path in glob.glob(os.path.join(PACKAGE, "**", "*.py"), recursive=True):
            with open(path, encoding="utf-8") as file:
                ast.parse(file.read(), path, feature_version=(3, 9))

    def test_its_types_hold(self):
        if shutil.which("mypy") is None:
            self.skipTest("there is no mypy")
        done = subprocess.run(["mypy", "--strict", "--cache-dir", self.folder, os.path.join(PACKAGE, "tarnreporting")],
                              capture_output=True, text=True, stdin=subprocess.DEVNULL)
        self.assertEqual(done.returncode, 0, done.stdout)


if __name__ == "__main__":
    logging.disable(logging.CRITICAL)
    unittest.main()
