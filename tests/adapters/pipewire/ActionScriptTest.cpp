// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/ActionScript.h"

#include "tests/adapters/pipewire/StreamBookFixture.h"

namespace tarn::streams {

class PipeWireScript : public StreamBookFixture {};

TEST_F(PipeWireScript, ASessionIsMadeTypedDescribedAndStarted) {
  EXPECT_EQ(scriptOf(Action(BeginSession{7, 2, "ox \"play\"", {{"media_role", std::string("Communication")}}})),
            "{\"op\": \"createReportingSession\", \"reporterID\": 7}\n"
            "{\"op\": \"setServiceType\", \"reporterID\": 7, \"serviceType\": \"telephony\"}\n"
            "{\"op\": \"setConfiguration\", \"reporterID\": 7, \"configuration\": "
            "{\"HostApplicationDisplayID\": \"ox \\\"play\\\"\", \"media_role\": \"Communication\"}}\n"
            "{\"op\": \"startReportingSessionForID\", \"reporterID\": 7}\n");
}

TEST_F(PipeWireScript, AMessageTellsEachKindOfValue) {
  const PostMessage post{7,
                         4,
                         1,
                         1'500'000'000'500'000'000,
                         {{"b", true}, {"i", std::int64_t{-2}}, {"d", 0.5}, {"w", 1.0}, {"t", std::string("x")}}};
  EXPECT_EQ(scriptOf(Action(post)),
            "{\"op\": \"sendMessage\", \"reporterIDs\": [7], \"category\": \"Playback\", \"type\": \"Start\", "
            "\"message\": {\"b\": true, \"i\": -2, \"d\": 0.5, \"w\": 1.0, \"t\": \"x\", "
            "\"tarnreporting_timestamp\": 1500000000.5}}\n");
}

TEST_F(PipeWireScript, ASessionIsStoppedAndLetGo) {
  EXPECT_EQ(scriptOf(Action(EndSession{7, 1})),
            "{\"op\": \"stopReportingSessionForID\", \"reporterID\": 7}\n"
            "{\"op\": \"destroyReportingSession\", \"reporterID\": 7}\n");
}

TEST_F(PipeWireScript, ATableHasARowForEachStream) {
  addSinks();
  addPlayer(at(10));
  run(at(11));
  EXPECT_EQ(tableOf(book.look()),
            "node  application  does   reported as    state    volume  format               device\n"
            "40    oxplay       plays  longformaudio  running  50 %    S16LE 48000 Hz 2 ch  speaker\n");
}

TEST_F(PipeWireScript, ATableTellsWhatIsMutedUnknownOrNotReported) {
  Rules rules;
  rules.off = true;
  StreamBook quiet(rules);
  quiet.nodeKnown(41, at(10),
                  nodeOf(NodeState::Suspended, {{"media.class", "Stream/Input/Audio"}, {"node.name", "a\x1b[m"}}));
  quiet.nodeKnown(42, at(10), nodeOf(NodeState::Error, {{"media.class", "Stream/Output/Audio"}, {"node.name", "b"}}));
  quiet.volumesKnown(42, at(10), {1.0F, true, false, {}, {}});
  EXPECT_EQ(tableOf(quiet.look()),
            "node  application  does     reported as   state      volume        format  device\n"
            "41    a\\u001b[m    records  not reported  suspended  -             -       -\n"
            "42    b            plays    not reported  error      100 %, muted  -       -\n");
}

TEST_F(PipeWireScript, WithoutStreamsThereIsALine) {
  EXPECT_EQ(tableOf({}), "no streams\n");
}

}  // namespace tarn::streams
