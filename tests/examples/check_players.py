# SPDX-License-Identifier: Apache-2.0
"""Plays generated files with the example players and compares what the recorder holds with what was played: durations
to 50 ms, volumes and routes exactly.

WAVPLAY and GST_PLUGIN_PATH name the programs that were built; what wasn't is left out.
"""

import json
import math
import os
import shutil
import struct
import subprocess
import sys
import unittest
import wave

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "clients", "python"))

from support import PACKAGE, PATIENCE, ROOT, WithService  # noqa: E402

WAVPLAY = os.environ.get("WAVPLAY")
WAVPLAY_PY = os.path.join(ROOT, "examples", "wavplay", "wavplay.py")
HAS_ELEMENT = "GST_PLUGIN_PATH" in os.environ and shutil.which("gst-launch-1.0")
TOLERANCE = 0.05


def write_sound(path, seconds, rate=48000, channels=2):
    with wave.open(path, "wb") as file:
        file.setparams((channels, 2, rate, 0, "NONE", ""))
        frames = (struct.pack("<h", int(8000 * math.sin(at * 0.05))) * channels for at in range(int(seconds * rate)))
        file.writeframes(b"".join(frames))


class Players(WithService):
    def setUp(self):
        super().setUp()
        self.sound = os.path.join(self.folder, "sound.wav")
        self.start()

    def run_player(self, *command, **environment):
        done = subprocess.run(command, capture_output=True, text=True, stdin=subprocess.DEVNULL, timeout=PATIENCE,
                              env={**os.environ, "TARNREPORTING_SOCKET": self.socket, "PYTHONPATH": PACKAGE,
                                   "GST_REGISTRY": os.path.join(self.folder, "registry"), **environment})
        self.assertEqual(done.returncode, 0, done.stderr)
        return done.stdout

    def segments(self, count):
        """Volume, route and seconds of each."""
        summaries = self.events_once_there_are(count, "Volume.Summary")
        return [(each["KvSessionVolume"], each["active_devices"], each["play_seconds"]) for each in summaries]

    def expect_segments(self, expected, more=0.0):
        """`more`: seconds of silence that may be in any of them."""
        found = self.segments(len(expected))
        self.assertEqual([each[:2] for each in found], [each[:2] for each in expected])
        for (_, _, seconds), (_, _, wanted) in zip(found, expected):
            self.assertGreater(seconds, wanted - TOLERANCE)
            self.assertLess(seconds, wanted + more + TOLERANCE)
        total = sum(seconds for *_, seconds in expected) + more
        self.assertAlmostEqual(sum(seconds for *_, seconds in found), total, delta=TOLERANCE)

    def play_through_changes(self, *player):
        write_sound(self.sound, 2.6)
        said = json.loads(self.run_player(*player, "--volume", "0.5", "--route", "Speaker", "--at", "0.9",
                                          "volume=0.3125", "--at", "1.7", "route=HeadphonesBT", self.sound))
        self.assertEqual((said["frames"], said["rate"], said["untaken"]), (124800, 48000, 0))
        self.expect_segments([(0.5, "Speaker", 0.9), (0.3125, "Speaker", 0.8), (0.3125, "HeadphonesBT", 0.9)],
                             said["silence"] / said["rate"])
        return said

    @unittest.skipUnless(WAVPLAY, "wavplay wasn't built")
    def test_wavplay_reports_volumes_routes_and_how_long_they_lasted(self):
        said = self.play_through_changes(WAVPLAY)
        self.assertEqual(len(self.events("IO.Error")), said["underruns"])

    @unittest.skipUnless(WAVPLAY, "wavplay wasn't built")
    def test_wavplay_reports_each_underrun(self):
        write_sound(self.sound, 1.2, rate=44100, channels=1)
        said = json.loads(self.run_player(WAVPLAY, "--volume", "1", "--at", "0.6", "stall=0.5", self.sound))
        self.assertGreater(said["underruns"], 0)
        overloads = self.events_once_there_are(said["underruns"], "IO.Error")
        self.assertEqual(len(overloads), said["underruns"])
        self.assertEqual({each["issue_type"] for each in overloads}, {"overload"})
        self.assertEqual({each["smallest_buffer_frame_size"] for each in overloads}, {441})
        self.expect_segments([(1, "Speaker", said["frames"] / 44100)], said["silence"] / 44100)

    @unittest.skipUnless(WAVPLAY, "wavplay wasn't built")
    def test_wavplay_plays_without_a_service(self):
        write_sound(self.sound, 0.3)
        self.stop()
        self.service = None
        said = json.loads(self.run_player(WAVPLAY, self.sound))
        self.assertEqual(said["frames"], 14400)
        self.assertEqual(said["untaken"], 2 + said["underruns"])

    @unittest.skipUnless(WAVPLAY, "wavplay wasn't built")
    def test_wavplay_tells_what_it_cannot_play(self):
        for words in (["nothing.wav"], ["--output", "no such device", self.sound]):
            write_sound(self.sound, 0.1)
            done = subprocess.run([WAVPLAY, *words], capture_output=True, text=True, stdin=subprocess.DEVNULL,
                                  timeout=PATIENCE)
            self.assertEqual(done.returncode, 1)
            self.assertIn("wavplay: ", done.stderr)

    def test_wavplay_in_python_reports_volumes_routes_and_how_long_they_lasted(self):
        self.play_through_changes(sys.executable, "-B", WAVPLAY_PY)

    def test_reporting_takes_few_lines(self):
        with open(os.path.join(ROOT, "examples", "wavplay", "reporting.c"), encoding="utf-8") as file:
            self.assertLess(len(file.readlines()), 60)
        with open(WAVPLAY_PY, encoding="utf-8") as file:
            lines = [line for line in file if any(word in line for word in ("tarnreporting", "session", "client"))]
        self.assertLess(len(lines), 25)

    @unittest.skipUnless(HAS_ELEMENT, "the element tarnreport wasn't built, or there is no gst-launch-1.0")
    def test_a_pipeline_with_tarnreport_makes_a_session_of_its_duration(self):
        write_sound(self.sound, 1.7)
        for count, sink in enumerate(("sync=true", "sync=false"), 1):
            self.run_player("gst-launch-1.0", "-q", "filesrc", f"location={self.sound}", "!", "wavparse", "!",
                            "tarnreport", "application=org.example.pipeline", "volume=0.25", f"route={sink[5:]}", "!",
                            "fakesink", sink)
            *_, last = self.segments(count)
            self.assertEqual(last[:2], (0.25, sink[5:]))
            self.assertAlmostEqual(last[2], 1.7, delta=TOLERANCE)
        summaries = self.events_once_there_are(2, "Session_Generic.Summary")
        self.assertEqual([each["HostApplicationDisplayID"] for each in summaries], ["org.example.pipeline"] * 2)
        self.assertEqual([each["summaryServiceName"] for each in summaries], ["longformaudio"] * 2)


if __name__ == "__main__":
    unittest.main()
