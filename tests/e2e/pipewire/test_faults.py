# SPDX-License-Identifier: Apache-2.0
"""PipeWire, the service and the adapter come and go."""

import signal
import unittest

from headless import Headless, eventually


class Faults(Headless):
    def test_pipewire_that_is_killed_ends_its_sessions_then_and_comes_back(self):
        self.start()
        self.streamer("before", 60)
        self.heard("before")
        self.end(self.pipewire)
        session = self.one("before")
        [last] = self.messages(session, "Generic.Stop")
        [stop] = self.messages(session, "Playback.Stop")
        self.assertEqual(last["end_reason"], "pipewire-ended")
        self.assertEqual(last["tarnreporting_timestamp"], stop["tarnreporting_timestamp"])
        self.end(self.manager)
        self.start_pipewire()
        self.assertTrue(eventually(lambda: self.adapter_log().count("looking at PipeWire") == 2))
        self.finish(self.streamer("after", 1))
        self.assertEqual(len(self.messages(self.one("after"), "Volume.Summary")), 1)
        self.assertEqual(len(self.sessions()), 2)

    def test_a_service_that_is_killed_hears_the_rest_from_where_it_began(self):
        self.start()
        player = self.streamer("lasting", 8)
        self.heard("lasting")
        self.end(self.service)
        self.start_service()
        self.finish(player)
        sessions = self.ended("lasting", 2)
        self.assertEqual([session["end_reason"] for session in sessions], ["killed", "stopped"])
        [first] = self.messages(sessions[0], "Playback.Start")
        [again] = self.messages(sessions[1], "Playback.Start")
        self.assertEqual(again["tarnreporting_timestamp"], first["tarnreporting_timestamp"])
        self.assertTrue(again["restated"])
        [summary] = self.messages(sessions[1], "Volume.Summary")
        self.assertEqual(self.messages(sessions[0], "Volume.Summary"), [])
        self.assertAlmostEqual(summary["play_seconds"], player.saw("ends") - player.saw("flows"),
                               delta=self.tolerance())

    def test_a_service_that_comes_late_hears_what_was_before(self):
        self.start_pipewire()
        self.start_adapter()
        self.assertTrue(eventually(lambda: "looking at PipeWire" in self.adapter_log()))
        early = self.streamer("early", 1)
        self.finish(early)
        self.start_service()
        session = self.one("early")
        [summary] = self.messages(session, "Volume.Summary")
        self.assertAlmostEqual(summary["play_seconds"], early.saw("ends") - early.saw("flows"), delta=self.tolerance())

    def test_a_pipewire_that_comes_late_is_found(self):
        self.start_service()
        self.start_adapter()
        self.assertTrue(eventually(lambda: "no PipeWire answers" in self.adapter_log()))
        self.start_pipewire()
        self.assertTrue(eventually(lambda: "looking at PipeWire" in self.adapter_log()))
        self.finish(self.streamer("late", 1))
        self.one("late")

    def test_what_the_service_refuses_is_told_with_its_words(self):
        config = self.write("narrow.toml", "[limits]\nsessions_per_connection = 1\n")
        self.start_service("--config", config)
        self.start_pipewire()
        self.start_adapter()
        self.assertTrue(eventually(lambda: "looking at PipeWire" in self.adapter_log()))
        self.streamer("one", 60)
        self.streamer("two", 60)
        self.assertTrue(eventually(lambda: "over quota" in self.adapter_log()), self.adapter_log())

    def test_an_adapter_that_ends_ends_its_sessions(self):
        self.start()
        self.streamer("cut", 60)
        self.heard("cut")
        self.end(self.adapter, signal.SIGTERM)
        self.assertEqual(self.adapter.returncode, 0)
        [last] = self.messages(self.one("cut"), "Generic.Stop")
        self.assertEqual(last["end_reason"], "adapter-ended")


class Printed(Headless):
    @staticmethod
    def text_of(path):
        with open(path, encoding="utf-8") as file:
            return file.read()

    def test_once_shows_a_table_and_nothing_is_sent(self):
        self.start_service()
        self.start_pipewire()
        self.streamer("shown", 60)
        self.assertTrue(eventually(lambda: self.runs("shown")))
        answer = self.tool(self.program, "--once", "--print", "--socket", self.socket)
        self.assertEqual(answer.returncode, 0, answer.stderr)
        [head, row] = answer.stdout.splitlines()
        self.assertEqual(head.split()[:3], ["node", "application", "does"])
        self.assertIn("org.test.shown", row)
        self.assertIn("standalone", row)
        self.assertIn("running", row)
        self.assertTrue(row.endswith("speaker"), row)
        self.assertEqual(self.sessions(), [])

    def test_once_without_pipewire_says_so(self):
        answer = self.tool(self.program, "--once", "--print")
        self.assertEqual(answer.returncode, 1)
        self.assertIn("no PipeWire answers", answer.stderr)

    def test_what_is_printed_is_a_script_that_the_tools_take(self):
        self.start_service()
        self.start_pipewire()
        path = self.folder + "/script.jsonl"
        with open(path, "wb") as file:
            self.adapter = self.spawn(self.program, "--print", "--log-level", "debug", "--socket", self.socket,
                                      stdout=file, stderr=self.log)
            self.assertTrue(eventually(lambda: "looking at PipeWire" in self.adapter_log()))
            printed = self.streamer("printed", 1)
            self.finish(printed)
            self.assertTrue(eventually(lambda: "destroyReportingSession" in self.text_of(path)))
            may = self.tolerance()
            self.end(self.adapter, signal.SIGTERM)
        self.assertEqual(self.sessions(), [])
        played = self.ctl("run", path)
        self.assertEqual(played.returncode, 0, played.stderr)
        [summary] = self.messages(self.one("printed"), "Volume.Summary")
        self.assertAlmostEqual(summary["play_seconds"], printed.saw("ends") - printed.saw("flows"), delta=may)

    def test_who_is_denied_is_not_reported(self):
        config = self.write("private.toml", '[applications]\ndeny = ["org.test.secret*"]\n')
        self.start("--config", config)
        self.finish(self.streamer("secret-player", 1), self.streamer("plain", 1))
        self.one("plain")
        self.assertEqual(self.sessions("secret%"), [])

    def test_titles_stay_here_unless_they_are_asked_for(self):
        self.start()
        self.finish(self.play("titled", 0.5))
        self.one("titled")
        told = " ".join(row[0] for row in self.rows("SELECT payload FROM events"))
        self.assertNotIn(".wav", told)

    def test_a_wrong_configuration_is_refused_in_one_line(self):
        config = self.write("wrong.toml", "[report]\nof = true\n")
        answer = self.tool(self.program, "--config", config)
        self.assertEqual(answer.returncode, 78)
        self.assertEqual(answer.stderr, f'tarnreporting-pipewire: {config}:2: unknown key "report.of"\n')
        self.assertEqual(self.tool(self.program, "--config", config + "x").returncode, 78)


if __name__ == "__main__":
    unittest.main()
