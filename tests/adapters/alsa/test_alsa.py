# SPDX-License-Identifier: Apache-2.0
"""The service, the adapter for ALSA, and a folder of the kernel's texts that the tests write."""

import os
import shutil
import signal
import sys
import time
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "e2e", "pipewire"))
from headless import Headless, eventually  # noqa: E402

RECORDED = os.path.join(HERE, "..", "..", "host", "drivers", "alsa", "idle")
PARAMETERS = ("access: RW_INTERLEAVED\nformat: S16_LE\nsubformat: STD\nchannels: 2\nrate: 44100 (44100/1)\n"
              "period_size: 441\nbuffer_size: 4410\n")
# Seconds between two looks.
INTERVAL = "0.05"


class Alsa(Headless):
    def setUp(self):
        super().setUp()
        self.proc = os.path.join(self.folder, "proc")
        shutil.copytree(RECORDED, os.path.join(self.proc, "asound"))
        self.counter = 0

    def kernel(self, path, text):
        """A text is there whole or not at all, as the kernel's are."""
        path = os.path.join(self.proc, path)
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path + ".new", "w", encoding="utf-8") as file:
            file.write(text)
        os.replace(path + ".new", path)

    def process(self, pid, name):
        self.kernel(f"{pid}/status", f"Name:\t{name}\nTgid:\t{pid}\nPid:\t{pid}\n")
        self.kernel(f"{pid}/comm", f"org.test.{name}\n")

    def pcm(self, name, state, pid=0, ago=0.0, overruns=0):
        """The sub-device has been in this state for so long."""
        folder = f"asound/card0/{name}/sub0/"
        if state == "closed":
            self.kernel(folder + "status", "closed\n")
            self.kernel(folder + "hw_params", "closed\n")
            return time.time()
        self.counter += 1
        trigger = 4000 + self.counter
        stamp = trigger + ago
        self.kernel(folder + "hw_params", PARAMETERS)
        self.kernel(folder + "status", f"state: {state}\nowner_pid   : {pid}\ntrigger_time: {trigger}.000000000\n"
                    f"tstamp      : {stamp:.9f}\ndelay       : 0\nhw_ptr      : 1\nxrun_counter: {overruns}\n")
        return time.time()

    def begin(self, *words):
        self.start_service()
        self.adapter = self.spawn(self.program, "--proc", self.proc, "--interval", INTERVAL, "--socket", self.socket,
                                  *words, stdout=self.log, stderr=self.log)

    def test_a_program_that_plays_by_alsa_has_its_session(self):
        self.process(700, "oxplay")
        self.begin()
        self.pcm("pcm0p", "RUNNING", 700, ago=3)
        self.heard("oxplay")
        self.pcm("pcm0p", "closed")
        session = self.one("oxplay")
        self.assertEqual((session["service_name"], session["end_reason"]), ("generic", "stopped"))
        [start] = self.messages(session, "Playback.Start")
        [stop] = self.messages(session, "Playback.Stop")
        [setup] = self.messages(session, "Playback.Setup")
        [last] = self.messages(session, "Generic.Stop")
        self.assertEqual((start["active_devices"], start["session_selected_format"]),
                         ("PCH:pcm0p", "S16LE 44100 Hz 2 ch"))
        self.assertEqual((setup["graph_quantum"], setup["stream_latency_frames"]), (441, 4410))
        ran = stop["tarnreporting_timestamp"] - start["tarnreporting_timestamp"]
        self.assertGreaterEqual(ran, 3)
        self.assertAlmostEqual(last["session_duration"], ran, delta=0.001)
        self.assertEqual(last["end_reason"], "stream-ended")

    def test_pauses_and_overruns_are_told_as_when_they_were(self):
        self.process(700, "oxplay")
        self.begin()
        self.pcm("pcm0p", "RUNNING", 700)
        self.heard("oxplay")
        self.pcm("pcm0p", "PAUSED", 700)
        self.heard("oxplay", "Playback.Stop")
        self.pcm("pcm0p", "RUNNING", 700)
        self.heard("oxplay", "Playback.Start", 2)
        self.pcm("pcm0p", "RUNNING", 700, overruns=2)
        self.heard("oxplay", "IO.Error")
        self.pcm("pcm0p", "closed")
        session = self.one("oxplay")
        [overload] = self.messages(session, "IO.Error")
        self.assertEqual((overload["issue_type"], overload["overload_cycles"], overload["smallest_buffer_frame_size"]),
                         ("overload", 2, 441))
        self.assertEqual([start["stream_run"] for start in self.messages(session, "Playback.Start")], [1, 2])
        [summary] = self.messages(session, "Session_Generic.Summary")
        self.assertEqual(summary["overload_count"], 1)

    def test_a_recording_is_input_of_its_own_process(self):
        self.process(700, "oxplay")
        self.process(800, "oxrecord")
        self.begin()
        self.pcm("pcm0p", "RUNNING", 700)
        self.pcm("pcm0c", "RUNNING", 800, ago=2)
        self.heard("oxrecord", "Input.Start")
        self.heard("oxplay")
        self.pcm("pcm0c", "closed")
        session = self.one("oxrecord")
        [summary] = self.messages(session, "Input.Summary")
        self.assertEqual(summary["active_devices"], "PCH:pcm0c")
        self.assertGreaterEqual(summary["inputrunning_seconds"], 2)
        self.assertFalse(self.sessions("oxplay")[0]["ended"])

    def test_a_sound_server_is_not_reported_and_the_end_of_the_adapter_ends_sessions(self):
        self.process(700, "oxplay")
        self.process(900, "server")
        self.kernel("900/comm", "pipewire\n")
        self.begin()
        self.pcm("pcm3p", "RUNNING", 900)
        self.pcm("pcm0p", "RUNNING", 700)
        self.heard("oxplay")
        self.end(self.adapter, signal.SIGTERM)
        self.assertEqual(self.adapter.returncode, 0)
        [last] = self.messages(self.one("oxplay"), "Generic.Stop")
        self.assertEqual(last["end_reason"], "adapter-ended")
        told = self.rows("SELECT application FROM sessions WHERE application IS NOT NULL")
        self.assertEqual([row["application"] for row in told], ["org.test.oxplay"])

    def test_types_of_applications_come_from_the_configuration(self):
        self.process(700, "oxcall")
        self.process(800, "oxsecret")
        config = self.write("alsa.toml", '[types]\n"org.test.ox*" = "telephony"\n'
                                         '[applications]\ndeny = ["org.test.oxsecret"]\n')
        self.begin("--config", config)
        self.pcm("pcm3p", "RUNNING", 800)
        self.pcm("pcm0p", "RUNNING", 700)
        self.heard("oxcall")
        self.pcm("pcm0p", "closed")
        self.assertEqual(self.one("oxcall")["service_name"], "telephony")
        self.assertEqual(self.sessions("oxsecret"), [])

    def test_once_shows_a_table_and_nothing_is_sent(self):
        self.start_service()
        self.process(700, "oxplay")
        self.pcm("pcm0p", "RUNNING", 700)
        answer = self.tool(self.program, "--once", "--print", "--proc", self.proc, "--socket", self.socket)
        self.assertEqual((answer.returncode, answer.stderr), (0, ""))
        [head, row] = answer.stdout.splitlines()
        self.assertEqual(head.split()[:3], ["node", "application", "does"])
        self.assertEqual(row.split()[1:5], ["org.test.oxplay", "plays", "generic", "running"])
        self.assertTrue(row.endswith("S16LE 44100 Hz 2 ch  PCH:pcm0p"), row)
        self.assertEqual(self.sessions(), [])

    def test_a_machine_without_sound_cards_waits_for_one(self):
        shutil.move(os.path.join(self.proc, "asound"), os.path.join(self.proc, "later"))
        self.process(700, "oxplay")
        self.begin()
        self.assertTrue(eventually(lambda: "there is no sound card" in self.adapter_log()))
        os.rename(os.path.join(self.proc, "later"), os.path.join(self.proc, "asound"))
        self.pcm("pcm0p", "RUNNING", 700)
        self.heard("oxplay")
        self.assertIn("there is a sound card now", self.adapter_log())

    def test_what_is_printed_is_a_script_that_the_tools_take(self):
        self.start_service()
        self.process(700, "oxplay")
        self.pcm("pcm0p", "RUNNING", 700, ago=1)
        path = os.path.join(self.folder, "script.jsonl")
        with open(path, "wb") as file:
            self.spawn(self.program, "--print", "--proc", self.proc, "--interval", INTERVAL, stdout=file)
        self.assertTrue(eventually(lambda: "Playback" in self.text_of(path)))
        self.pcm("pcm0p", "closed")
        self.assertTrue(eventually(lambda: "destroyReportingSession" in self.text_of(path)))
        self.assertEqual(self.sessions(), [])
        played = self.ctl("run", path)
        self.assertEqual(played.returncode, 0, played.stderr)
        self.one("oxplay")

    @staticmethod
    def text_of(path):
        with open(path, encoding="utf-8") as file:
            return file.read()


if __name__ == "__main__":
    unittest.main()
