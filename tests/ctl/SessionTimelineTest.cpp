// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionTimeline.h"

#include "tests/ctl/SessionMessages.h"

namespace tarn::ctl {
namespace {

constexpr const char* kRuns = R"("session_output_running":true)";
constexpr const char* kStops = R"("session_output_running":false)";

std::string textOf(const std::vector<SessionTimeline::Span>& spans) {
  std::string text;
  for (const auto& span : spans) {
    text += plist::ValueView(span.from).asText() + "-" + plist::ValueView(span.to).asText() +
            (span.text.empty() ? "" : ":" + span.text) + " ";
  }
  return text;
}

std::vector<std::string> textOf(const std::vector<SessionTimeline::Mark>& marks) {
  std::vector<std::string> texts;
  for (const auto& mark : marks) {
    texts.push_back(plist::ValueView(mark.at).asText() + " " + mark.text);
  }
  return texts;
}

using Texts = std::vector<std::string>;

TEST(SessionTimeline, OutputRunsFromOneMessageToAnother) {
  const auto timeline = timelineOf({messageAt(10, "Playback.Start", kRuns), messageAt(12, "Playback.Start", kRuns),
                                    messageAt(20, "Playback.Stop", kStops), messageAt(30, "Playback.Start", kRuns),
                                    messageAt(45, "Generic.Generic")});
  EXPECT_EQ(textOf(timeline.output), "10-20 30-45 ");
  EXPECT_EQ(timeline.first, 10);
  EXPECT_EQ(timeline.last, 45);
}

TEST(SessionTimeline, TheClientsOwnEndStopsBoth) {
  const auto timeline =
      timelineOf({messageAt(10, "Playback.Start", R"("session_output_running":true,"session_input_running":true)"),
                  messageAt(20, "Playback.Stop", R"("session_duration":10)"), messageAt(30, "Generic.Generic")});
  EXPECT_EQ(textOf(timeline.output), "10-20 ");
  EXPECT_EQ(textOf(timeline.input), "10-20 ");
  EXPECT_EQ(textOf(timeline.steps),
            (Texts{"10 output runs, input runs", "20 output stops, input stops, the client's session is over"}));
}

TEST(SessionTimeline, ARouteLastsUntilTheNext) {
  const auto timeline = timelineOf({messageAt(10, "Playback.Start", R"("active_devices":"Speaker")"),
                                    messageAt(12, "Volume.Generic", R"("active_devices":"Speaker")"),
                                    messageAt(20, "RouteChange.Generic", R"("active_devices":"Headphones")"),
                                    messageAt(30, "Generic.Generic")});
  EXPECT_EQ(textOf(timeline.routes), "10-20:Speaker 20-30:Headphones ");
  EXPECT_EQ(textOf(timeline.steps), (Texts{"10 route Speaker", "20 route Headphones"}));
}

TEST(SessionTimeline, VolumesAreChanges) {
  const auto timeline = timelineOf({messageAt(10, "Volume.Generic", R"("KvSessionVolume":0.5)"),
                                    messageAt(11, "Volume.Generic", R"("KvSessionVolume":0.5)"),
                                    messageAt(12, "Volume.Generic", R"("KvSessionVolume":0.25)")});
  ASSERT_EQ(timeline.volumes.size(), 2U);
  EXPECT_EQ(timeline.volumes[1].at, 12);
  EXPECT_EQ(timeline.volumes[1].value, 0.25);
}

TEST(SessionTimeline, FaultsAreMarked) {
  const auto timeline =
      timelineOf({messageAt(10, "IO.Error", R"("issue_type":"overload")"),
                  messageAt(11, "Playback.IssueDetector", R"("issue_type":"Silence")"), messageAt(12, "Playback.Error"),
                  messageAt(13, "Error.Generic"), messageAt(14, "Playback.Generic", R"("issue_type":"Silence")")});
  EXPECT_EQ(textOf(timeline.overloads), Texts{"10 IO.Error"});
  EXPECT_EQ(textOf(timeline.errors),
            (Texts{"11 Playback.IssueDetector Silence", "12 Playback.Error", "13 Error.Generic"}));
}

TEST(SessionTimeline, GroupsAreJoinedAndLeft) {
  const auto timeline = timelineOf({messageAt(10, "Lagoon.Generic", R"("lagoon_session":1)"),
                                    messageAt(11, "Lagoon.Generic", R"("lagoon_session":1)"),
                                    messageAt(12, "Lagoon.Generic", R"("lagoon_session":0)")});
  EXPECT_EQ(textOf(timeline.steps), (Texts{"10 joins a group", "12 leaves the group"}));
}

TEST(SessionTimeline, GoesByStampsAndPassesOverWhatWasDerived) {
  const auto timeline = timelineOf({messageAt(20, "Playback.Stop", kStops), messageAt(10, "Playback.Start", kRuns),
                                    messageAt(90, "Volume.Summary", R"("msgidx":1,"msgcnt":1,"KvSessionVolume":0.5)")});
  EXPECT_EQ(textOf(timeline.output), "10-20 ");
  EXPECT_TRUE(timeline.volumes.empty());
  EXPECT_EQ(timeline.last, 20);
}

TEST(SessionTimeline, WithoutMessagesThereIsNothing) {
  const auto timeline = timelineOf({});
  EXPECT_TRUE(timeline.steps.empty());
  EXPECT_TRUE(timeline.output.empty());
}

}  // namespace
}  // namespace tarn::ctl
