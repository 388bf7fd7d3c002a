# SPDX-License-Identifier: Apache-2.0
"""What was played and what is recorded of it, with a real PipeWire."""

import signal
import time
import unittest

from headless import Headless, eventually

ROLES = {"Music": "longformaudio", "Movie": "longformaudio", "Game": "nonlongformaudio",
         "Communication": "telephony", "Notification": "alerts", "Accessibility": "systemsounds",
         "Production": "standalone", "": "generic"}
# pw-play writes so far ahead, and lets run out what it wrote.
LATENCY = 0.1
# What is ended before it is over; and what makes a segment, which takes more than half a second.
LONG = 60
SEGMENT = 0.75


class Managed(Headless):
    def routes(self, session):
        """What tells a route, in the order of time: another sink may have it paused, or not."""
        told = self.messages(session, "Playback.Start") + self.messages(session, "RouteChange.Generic")
        return sorted(told, key=lambda message: message["tarnreporting_timestamp"])

    def volumes(self, name):
        """What tells a volume, in the order of time: of a stream with one run."""
        return [message for session in self.sessions(name)
                for message in self.messages(session, "Playback.Start") + self.messages(session, "Volume.Generic")]

    def plays_to(self, name, device):
        self.assertTrue(eventually(lambda: self.routes(self.sessions(name)[0])[-1]["active_devices"] == device))
        time.sleep(SEGMENT)

    def test_each_role_is_a_session_of_its_type(self):
        self.start()
        players = [self.play(f"role{i}", 1, role=role) for i, role in enumerate(ROLES)]
        self.finish(*players)
        for i, (role, service) in enumerate(ROLES.items()):
            session = self.one(f"role{i}")
            self.assertEqual(session["service_name"], service, role)
            self.assertEqual(session["end_reason"], "stopped")
            [start] = self.messages(session, "Playback.Start")
            self.assertEqual(start["active_devices"], "speaker")
            self.assertEqual(start["session_selected_format"], "S16LE 48000 Hz 2 ch")

    def test_what_was_played_is_told_as_when_it_was(self):
        self.start()
        streamer = self.streamer("exact", 3)
        self.heard("exact")
        may_start = self.tolerance()
        self.mark()
        self.finish(streamer)
        session = self.one("exact")
        may_stop = self.tolerance()
        [start] = self.messages(session, "Playback.Start")
        [stop] = self.messages(session, "Playback.Stop")
        [summary] = self.messages(session, "Volume.Summary")
        self.assertAlmostEqual(start["tarnreporting_timestamp"], streamer.saw("flows"), delta=may_start)
        self.assertAlmostEqual(stop["tarnreporting_timestamp"], streamer.saw("ends"), delta=may_stop)
        self.assertAlmostEqual(summary["play_seconds"], streamer.saw("ends") - streamer.saw("flows"),
                               delta=max(may_start, may_stop))

    def test_what_was_played_is_as_long_as_it_was(self):
        self.start()
        first = self.play("long", 4)
        second = self.play("short", 2)
        self.finish(first, second)
        for name, seconds in (("long", 4), ("short", 2)):
            session = self.one(name)
            [summary] = self.messages(session, "Volume.Summary")
            [start] = self.messages(session, "Playback.Start")
            [stop] = self.messages(session, "Playback.Stop")
            [last] = self.messages(session, "Generic.Stop")
            ran = stop["tarnreporting_timestamp"] - start["tarnreporting_timestamp"]
            self.assertAlmostEqual(summary["play_seconds"], ran, delta=0.001)
            self.assertAlmostEqual(last["session_duration"], ran, delta=0.001)
            self.assertEqual(summary["active_devices"], "speaker")
            self.assertEqual(summary["KvSessionVolume"], 1)
            self.assertGreater(ran, seconds - self.tolerance(), name)
            self.assertLess(ran, seconds + LATENCY + self.tolerance(), name)

    def test_steps_of_volume_and_mute_are_exact(self):
        self.start()
        player = self.play("steps", LONG, "--volume", "0.125")
        # pw-play sets it when it runs already.
        self.assertTrue(eventually(lambda: [told for told in self.volumes("steps") if told["volume_linear"] == 0.125]))
        before = self.volumes("steps")
        for count, step in enumerate(("{ channelVolumes: [ 0.216, 0.027 ], volume: 1.0 }", "{ mute: true }",
                                      "{ mute: false, channelVolumes: [ 0.421875, 0.421875 ] }"),
                                      len(before)):
            self.set_props("steps", step)
            self.heard("steps", "Volume.Generic", count)
        self.end(player)
        self.one("steps")
        told = [(step["KvSessionVolume"], step["volume_linear"]) for step in before]
        self.assertEqual(told[len(told) - 1:], [(0.5, 0.125)])
        self.assertIn(told[:len(told) - 1], ([], [(1, 1)]))
        steps = [(step["KvSessionVolume"], step["muted"], step["channel_volumes"])
                 for step in self.volumes("steps")[len(before):]]
        self.assertEqual(steps, [(0.6, False, "0.216,0.027"), (0, True, "0.216,0.027"),
                                 (0.75, False, "0.421875,0.421875")])

    def test_a_move_to_another_sink_is_a_change_of_route(self):
        self.start()
        player = self.play("moved", LONG)
        self.heard("moved")
        time.sleep(SEGMENT)
        self.tool("pw-metadata", str(self.node("moved")["id"]), "target.object", "headset")
        self.plays_to("moved", "headset")
        self.end(player)
        session = self.one("moved")
        told = self.routes(session)
        there = told[-1]
        self.assertEqual((told[0]["active_devices"], there["active_devices"]), ("speaker", "headset"))
        self.assertEqual((there["device_bus"], there["device_form_factor"], there["bluetooth_codec"],
                          there["device_profile"]), ("bluetooth", "headset", "aac", "a2dp-sink"))
        played = sum(summary["play_seconds"] for summary in self.messages(session, "Volume.Summary"))
        [last] = self.messages(session, "Generic.Stop")
        self.assertAlmostEqual(played, last["session_duration"], delta=self.tolerance())

    def test_another_default_moves_who_follows_it(self):
        self.start()
        player = self.play("follower", LONG)
        self.heard("follower")
        self.tool("pw-metadata", "0", "default.configured.audio.sink", '{ "name": "headset" }', "Spa:String:JSON")
        self.plays_to("follower", "headset")
        # PipeWire may tell of the link before it tells of the default.
        self.assertTrue(eventually(lambda: self.routes(self.sessions("follower")[0])[-1]["device_is_default"]),
                        (self.default_sink(), self.routes(self.sessions("follower")[0])))
        self.end(player)
        session = self.one("follower")
        told = self.routes(session)
        self.assertEqual((told[0]["active_devices"], told[0]["device_is_default"]), ("speaker", True))
        self.assertEqual((told[-1]["active_devices"], told[-1]["device_is_default"]), ("headset", True))

    def test_a_recording_is_input(self):
        self.start()
        recorder = self.streamer("recorder", 2, "record")
        self.finish(recorder)
        session = self.one("recorder")
        self.assertEqual(session["service_name"], "standalone")
        [start] = self.messages(session, "Input.Start")
        [stop] = self.messages(session, "Input.Stop")
        [summary] = self.messages(session, "Input.Summary")
        self.assertTrue(start["session_input_running"])
        self.assertEqual((summary["active_devices"], start["device_bus"]), ("microphone", "usb"))
        self.assertAlmostEqual(summary["inputrunning_seconds"],
                               stop["tarnreporting_timestamp"] - start["tarnreporting_timestamp"], delta=0.001)
        self.assertAlmostEqual(summary["inputrunning_seconds"], recorder.saw("ends") - recorder.saw("flows"),
                               delta=self.tolerance())

    def test_a_pause_is_no_playing(self):
        self.start()
        corked = self.streamer("corked", 5, "pause=1,2")
        self.finish(corked)
        session = self.one("corked")
        starts = self.messages(session, "Playback.Start")
        stops = self.messages(session, "Playback.Stop")
        self.assertEqual([start["stream_run"] for start in starts], [1, 2])
        paused = corked.saw("resumed") - corked.saw("paused")
        self.assertAlmostEqual(starts[1]["tarnreporting_timestamp"] - stops[0]["tarnreporting_timestamp"], paused,
                               delta=self.tolerance())
        played = [summary["play_seconds"] for summary in self.messages(session, "Volume.Summary")]
        self.assertEqual(len(played), 2)
        [last] = self.messages(session, "Generic.Stop")
        self.assertAlmostEqual(sum(played), last["session_duration"], delta=0.001)
        self.assertAlmostEqual(sum(played), corked.saw("ends") - corked.saw("flows") - paused, delta=self.tolerance())

    def test_a_stream_that_dawdles_has_an_overload_as_long_as_that(self):
        self.start()
        dawdler = self.streamer("dawdler", LONG, "dawdle=500")
        # Only of cycles since the profiler told first is anything known; it tells once a second or so.
        self.heard("dawdler", "Playback.Setup")
        dawdler.process.send_signal(signal.SIGUSR1)
        slept = dawdler.saw("dawdled")
        self.assertTrue(eventually(lambda: [issue for issue in self.messages(self.sessions("dawdler")[0], "IO.Error")
                                            if issue["overload_seconds"] > slept / 2]))
        may = self.tolerance()
        self.end(dawdler.process)
        session = self.one("dawdler")
        overloads = self.messages(session, "IO.Error")
        longest = max(overloads, key=lambda overload: overload["overload_seconds"])
        self.assertAlmostEqual(longest["overload_seconds"], slept, delta=may)
        self.assertEqual(longest["issue_type"], "overload")
        setups = self.messages(session, "Playback.Setup")
        self.assertEqual({setup["graph_quantum"] for setup in setups}, {longest["smallest_buffer_frame_size"]})
        [summary] = self.messages(session, "Session_Generic.Summary")
        self.assertEqual(summary["overload_count"], len(overloads))

    def test_many_streams_have_a_session_each_and_none_stays_open(self):
        self.start()
        for wave in range(4):
            players = [self.play(f"many{wave}-{i}", LONG) for i in range(5)]
            for i, player in enumerate(players):
                # One that came and went between two looks wouldn't be seen.
                self.heard(f"many{wave}-{i}")
                self.end(player, signal.SIGINT)
        self.ended("many%", 20)
        names = [session["application"] for session in self.sessions("many%")]
        self.assertEqual(sorted(names), sorted(f"org.test.many{wave}-{i}" for wave in range(4) for i in range(5)))
        for session in self.sessions("many%"):
            self.assertEqual(len(self.messages(session, "Playback.Start")),
                             len(self.messages(session, "Playback.Stop")))


class Unmanaged(Headless):
    managed = False

    def test_links_alone_make_the_route(self):
        self.start()
        player = self.play("linked", 2)
        self.finish(player)
        session = self.one("linked")
        [start] = self.messages(session, "Playback.Start")
        self.assertEqual(start["active_devices"], "speaker")
        self.assertEqual(len(self.messages(session, "Volume.Summary")), 1)

    def test_several_sinks_are_a_group(self):
        self.start()
        player = self.play("group", LONG)
        self.heard("group")
        self.link("group", "headset")
        self.heard("group", "Lagoon.Start")
        time.sleep(SEGMENT)
        self.end(player)
        session = self.one("group")
        [begun] = self.messages(session, "Lagoon.Start")
        self.assertEqual(begun["lagoon_session"], 1)
        [stop] = self.messages(session, "Playback.Stop")
        summaries = self.messages(session, "Lagoon.Summary")
        self.assertEqual({summary["active_devices"] for summary in summaries}, {"headset,speaker"})
        self.assertAlmostEqual(sum(summary["play_seconds"] for summary in summaries),
                               stop["tarnreporting_timestamp"] - begun["tarnreporting_timestamp"],
                               delta=self.tolerance())

    def test_a_sink_that_is_destroyed_ends_the_run(self):
        self.start()
        player = self.play("orphan", LONG)
        self.heard("orphan")
        self.tool("pw-cli", "destroy", str(self.node("speaker")["id"]))
        self.heard("orphan", "Playback.Stop")
        self.end(player)
        session = self.one("orphan")
        [start] = self.messages(session, "Playback.Start")
        self.assertEqual(start["active_devices"], "speaker")
        [last] = self.messages(session, "Generic.Stop")
        self.assertEqual(last["end_reason"], "stream-ended")

    def test_a_stream_that_never_runs_has_a_session_without_runs(self):
        self.start()
        player = self.spawn("pw-play", "--target", "0", "-P", '{ node.name = idle application.id = "org.test.idle" }',
                            self.wav(1))
        self.assertTrue(eventually(lambda: self.sessions("idle")))
        self.end(player)
        session = self.one("idle")
        self.assertEqual(self.messages(session, "Playback.Start"), [])
        [last] = self.messages(session, "Generic.Stop")
        self.assertNotIn("session_duration", last)


if __name__ == "__main__":
    unittest.main()
