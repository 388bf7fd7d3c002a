// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "derived/TarnReportingSessionInputMessagesWorker.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "testing/FakePlatform.h"
#include "tests/derived/DerivedMessages.h"

namespace tarn {
namespace {

using namespace testing;

class CreateInputMessages : public ::testing::Test {
 protected:
  static TarnReportingSessionMessageList create(const TarnReportingSessionMessages& messages,
                                                const plist::Dictionary& previousValues = {},
                                                std::string_view process = "phone") {
    return TarnReportingSessionInputMessagesWorker::createInputMessages(messageListOf(messages),
                                                                        previous(previousValues), process, 0.5);
  }
  static std::shared_ptr<TarnReportingSessionMessage> start(double time, plist::Dictionary more = {}) {
    more.set("session_input_running", true);
    return at(time, std::move(more));
  }
  static std::shared_ptr<TarnReportingSessionMessage> end(double time, plist::Dictionary more = {}) {
    more.set("session_input_running", false);
    return at(time, std::move(more));
  }
  static std::shared_ptr<TarnReportingSessionMessage> codec(double time, const plist::ValueView& name,
                                                            const plist::ValueView& rate) {
    return at(time, {{"vp_config_primary_vocoder", name}, {"vp_config_primary_vocoderFs", rate}});
  }

  FakePlatform platform_;
};

const std::vector<std::string> kColumns{"inputrunning_seconds", "vocoders", "msgidx", "msgcnt"};

TEST_F(CreateInputMessages, InputWithOneCodecYieldsOneMessage) {
  const auto derived = create({start(0), codec(10, "opus", "16000.0"), end(60)});
  ASSERT_EQ(derived.size(), 1U);
  EXPECT_EQ(derived[0]->category(), AudioEventCategory::Input);
  EXPECT_EQ(derived[0]->type(), AudioEventType::Summary);
  EXPECT_TRUE(derived[0]->destinationWorkers().empty());
  EXPECT_EQ(plist::description(derived[0]->message()),
            "{HostApplicationDisplayID = phone; inputrunning_seconds = 60; inputrunning_secondsBucketed = 60; msgidx = "
            "1; vp_config_operation_mode = unknown; vp_config_input_port = unknown; active_devices = unknown; vocoders "
            "= opus:16000.0; msgcnt = 1}");
  EXPECT_EQ(derived[0]->message().get("inputrunning_seconds").kind(), plist::Kind::Float);
}

TEST_F(CreateInputMessages, CodecWithRateZeroIsNeverListed) {
  EXPECT_EQ(rows(create({start(0), codec(10, "opus", "0.0"), end(60)}), kColumns), (Rows{"60 (null) 1 1"}));
  EXPECT_EQ(rows(create({start(0), codec(10, "opus", 0.5), end(60)}), kColumns), (Rows{"60 (null) 1 1"}));
}

TEST_F(CreateInputMessages, CodecWithARateThatOnlyLooksLikeZeroIsListed) {
  const auto vocoders = [](const plist::ValueView& rate) {
    return rows(create({start(0), codec(10, "opus", rate), end(60)}), {"vocoders"});
  };
  EXPECT_EQ(vocoders("08.0"), (Rows{"opus:08.0"}));
  EXPECT_EQ(vocoders("0"), (Rows{"opus:0"}));
  EXPECT_EQ(vocoders(0), (Rows{"opus:0"}));
  EXPECT_EQ(vocoders(" 0.0"), (Rows{"opus: 0.0"}));
  EXPECT_EQ(vocoders("10.0"), (Rows{"opus:10.0"}));
}

TEST_F(CreateInputMessages, CodecIsUnknownBeforeItIsTold) {
  EXPECT_EQ(rows(create({start(0), codec(10, "unknown", "8000.0"), end(60)}), kColumns), (Rows{"60 (null) 1 1"}));
}

TEST_F(CreateInputMessages, DevicesAreUnknownBeforeTheyAreTold) {
  EXPECT_EQ(rows(create({start(0), at(10, {{"active_devices", "unknown"}}), end(60)}), kColumns),
            (Rows{"60 (null) 1 1"}));
}

TEST_F(CreateInputMessages, PreviousValuesFillTheState) {
  const auto derived = create({start(0), end(10)}, {{"active_devices", "Headset"},
                                                    {"vp_config_operation_mode", "wide"},
                                                    {"vp_config_input_port", "mic"},
                                                    {"other", 1}});
  EXPECT_EQ(rows(derived, {"active_devices", "vp_config_operation_mode", "vp_config_input_port"}),
            (Rows{"Headset wide mic"}));
}

TEST_F(CreateInputMessages, CodecsAreSortedAndListedOnce) {
  EXPECT_EQ(rows(create({start(0), codec(10, "opus", "16000.0"), codec(20, "amr", "8000.0"),
                         codec(30, "opus", "16000.0"), end(60)}),
                 kColumns),
            (Rows{"60 amr:8000.0,opus:16000.0 1 1"}));
}

TEST_F(CreateInputMessages, DeviceChangeWhileRunningCutsTheSegment) {
  EXPECT_EQ(rows(create({start(0), at(30, {{"active_devices", "Headset"}}), end(50)}),
                 {"inputrunning_seconds", "active_devices", "msgidx", "msgcnt"}),
            (Rows{"30 unknown 1 2", "20 Headset 2 2"}));
}

TEST_F(CreateInputMessages, HalfASecondYieldsNothingAndItsCodecsCountForTheNextMessage) {
  EXPECT_TRUE(create({start(0), end(0.5)}).empty());
  EXPECT_EQ(create({start(0), end(std::nextafter(0.5, 1))}).size(), 1U);
  EXPECT_EQ(rows(create({start(0), codec(0.2, "opus", "16000.0"), end(0.5), start(1), codec(2, "amr", "8000.0"), end(9),
                         start(10), end(20)}),
                 kColumns),
            (Rows{"8 amr:8000.0,opus:16000.0 1 2", "10 (null) 2 2"}));
}

TEST_F(CreateInputMessages, SessionDurationEndsTheSegment) {
  EXPECT_EQ(rows(create({start(0), at(10, {{"session_duration", 10.0}})}), kColumns), (Rows{"10 (null) 1 1"}));
  // Input has ended with it: neither the device nor the late stop starts or ends anything.
  EXPECT_EQ(
      rows(create({start(0), at(10, {{"session_duration", 10.0}}), at(20, {{"active_devices", "Headset"}}), end(30)}),
           kColumns),
      (Rows{"10 (null) 1 1"}));
}

TEST_F(CreateInputMessages, RunningToldAgainIsNoStart) {
  EXPECT_EQ(rows(create({start(0), start(20), end(30)}), kColumns), (Rows{"30 (null) 1 1"}));
}

TEST_F(CreateInputMessages, DifferencesSeenWhileNotRunningAreNoSegment) {
  // The running state still says that input runs; the session's end says that it doesn't.
  create({start(0), at(10, {{"session_duration", 10.0}}), at(20, {{"active_devices", "Headset"}})});
  EXPECT_EQ(segmentsLookedAt(platform_), 1U);
}

TEST_F(CreateInputMessages, EndsWithoutRunningInputAreNoSegment) {
  create({end(0), end(10), at(20, {{"session_duration", 20.0}}), start(30, {{"session_duration", 30.0}})});
  EXPECT_EQ(segmentsLookedAt(platform_), 0U);
}

TEST_F(CreateInputMessages, SessionDurationInARunningMessageCutsAndGoesOn) {
  EXPECT_EQ(rows(create({start(0), start(10, {{"session_duration", 10.0}}), end(15)}), kColumns),
            (Rows{"10 (null) 1 2", "5 (null) 2 2"}));
}

TEST_F(CreateInputMessages, CodecChangeAloneDoesNotCut) {
  EXPECT_EQ(rows(create({start(0), codec(10, "opus", "16000.0"), codec(20, "amr", "8000.0"), end(30)}),
                 {"inputrunning_seconds"}),
            (Rows{"30"}));
}

TEST_F(CreateInputMessages, CodecsSeenWhileNotRunningAreNotListed) {
  EXPECT_EQ(rows(create({codec(0, "opus", "16000.0"), start(1), codec(2, "opus", "16000.0"), end(10)}), kColumns),
            (Rows{"9 (null) 1 1"}));
}

TEST_F(CreateInputMessages, CodecOfTheStartingMessageIsListed) {
  EXPECT_EQ(rows(create({start(0, {{"vp_config_primary_vocoder", "evs"}, {"vp_config_primary_vocoderFs", "32000.0"}}),
                         end(10)}),
                 kColumns),
            (Rows{"10 evs:32000.0 1 1"}));
}

TEST_F(CreateInputMessages, CodecOfTheCuttingMessageBelongsToTheEndedSegment) {
  EXPECT_EQ(rows(create({start(0),
                         at(5, {{"active_devices", "Headset"},
                                {"vp_config_primary_vocoder", "evs"},
                                {"vp_config_primary_vocoderFs", "32000.0"}}),
                         end(10)}),
                 kColumns),
            (Rows{"5 evs:32000.0 1 2", "5 (null) 2 2"}));
}

TEST_F(CreateInputMessages, CodecThatThePreviousValuesHoldIsNoChange) {
  EXPECT_EQ(rows(create({start(0), codec(10, "opus", "16000.0"), end(60)}, {{"vp_config_primary_vocoder", "opus"}}),
                 kColumns),
            (Rows{"60 (null) 1 1"}));
}

TEST_F(CreateInputMessages, VoiceProcessingValuesAreThoseOfTheSegment) {
  EXPECT_EQ(rows(create({start(0, {{"vp_config_operation_mode", "wide"}, {"vp_config_input_port", "mic"}}),
                         end(10, {{"vp_config_operation_mode", "narrow"}}), start(20), end(30)}),
                 {"vp_config_operation_mode", "vp_config_input_port"}),
            (Rows{"wide mic", "narrow mic"}));
}

TEST_F(CreateInputMessages, EmptyProcessNameYieldsNothing) {
  EXPECT_TRUE(create({start(0), end(10)}, {}, "").empty());
}

TEST_F(CreateInputMessages, InputThatRanBeforeHasNoStart) {
  const plist::Dictionary running{{"session_input_running", true}, {"tarnreporting_timestamp", 0.0}};
  EXPECT_TRUE(create({end(10)}, running).empty());
  EXPECT_TRUE(create({start(5), end(10)}, running).empty());
  // A cut without a start is skipped, but the next segment begins there.
  EXPECT_EQ(rows(create({start(5, {{"active_devices", "Headset"}}), end(10)}, running), kColumns),
            (Rows{"5 (null) 1 1"}));
}

TEST_F(CreateInputMessages, MessageWithoutTheKeyKeepsInputNotRunning) {
  const plist::Dictionary running{{"session_input_running", true}, {"tarnreporting_timestamp", 0.0}};
  EXPECT_TRUE(create({at(5, {{"active_devices", "Headset"}}), end(10)}, running).empty());
}

TEST_F(CreateInputMessages, SpatialSettingsWithinTwoSecondsAreFolded) {
  const TarnReportingSessionMessages messages{
      start(0), at(5, {{"spatial-audio-accessory-feature", true}, {"active_devices", "Headset"}}),
      at(6.5, {{"spatializationEnabled", true}, {"active_devices", "unknown"}}), end(10)};
  EXPECT_EQ(rows(create(messages), {"inputrunning_seconds"}), (Rows{"10"}));
  EXPECT_EQ(messages[1]->message().get("tarnreporting_timestamp").asDouble(), 6.5);
  EXPECT_EQ(rows(create({start(0), at(5, {{"spatial-audio-accessory-feature", true}, {"active_devices", "Headset"}}),
                         at(7, {{"spatializationEnabled", true}, {"active_devices", "unknown"}}), end(10)}),
                 {"inputrunning_seconds"}),
            (Rows{"5", "2", "3"}));
}

TEST_F(CreateInputMessages, MessageOfBothSpatialSettingsIsFiledUnderTheAccessory) {
  const TarnReportingSessionMessages messages{
      start(0), at(5, {{"spatial-audio-accessory-feature", true}, {"spatializationEnabled", true}}),
      at(6, {{"spatializationEnabled", false}}), end(10)};
  create(messages);
  EXPECT_FALSE(messages[1]->message().get("spatializationEnabled").asBool());
}

TEST_F(CreateInputMessages, ValuesOfTheWrongKindAreReadAsConverted) {
  EXPECT_EQ(rows(create({stamped("0", {{"session_input_running", "1"}}), codec(1, 7, 16000.0),
                         codec(2, "bare", plist::ValueView()), at(10, {{"session_input_running", "no"}})}),
                 kColumns),
            (Rows{"10 7:16000,bare:(null) 1 1"}));
  EXPECT_EQ(rows(create({start(0, {{"active_devices", 5}}), at(5, {{"active_devices", "5"}}), end(9)}),
                 {"inputrunning_seconds"}),
            (Rows{"5", "4"}));  // a number and a text are different values
}

TEST_F(CreateInputMessages, SegmentsWithoutATimeOrAStartAreSkipped) {
  EXPECT_TRUE(create({start(0), unstamped({{"session_input_running", false}})}).empty());
  EXPECT_TRUE(create({start(-10), unstamped({{"session_input_running", false}})}).empty());
  EXPECT_TRUE(create({unstamped({{"session_input_running", true}}), end(10)}).empty());
}

TEST_F(CreateInputMessages, AbsurdTimesAreTakenAsTheyAre) {
  EXPECT_TRUE(create({start(10), end(10)}).empty());
  EXPECT_TRUE(create({start(10), end(-5)}).empty());
  EXPECT_TRUE(create({start(0), end(std::nan(""))}).empty());
  const double infinity = std::numeric_limits<double>::infinity();
  EXPECT_EQ(rows(create({start(-infinity), end(0)}), {"inputrunning_seconds", "inputrunning_secondsBucketed"}),
            (Rows{"inf 18000"}));
}

TEST_F(CreateInputMessages, LogsWhatItDoes) {
  create({start(1), end(3), start(4), end(4.25)});
  EXPECT_EQ(platform_.log.messages(),
            (std::vector<std::string>{
                "entering createInputMessages createInputMessages",
                "runningTime { func=createInputMessages, runningTime=2.000000, tarnTimestamp=3, "
                "tarnTimestamp_double=3.000000, startTarnTimestamp=1, startTarnTimestamp_double=1.000000 }",
                "added input message { func=createInputMessages, action=add, count=1 }",
                "runningTime { func=createInputMessages, runningTime=0.250000, tarnTimestamp=4.25, "
                "tarnTimestamp_double=4.250000, startTarnTimestamp=4, startTarnTimestamp_double=4.000000 }",
                "skipped input message, too short { func=createInputMessages, action=skip, count=1 }",
                "returning input messages { func=createInputMessages, action=return, count=1 }"}));
  for (const auto& entry : platform_.log.entries()) {
    EXPECT_EQ(entry.level, LogLevel::Debug);
    EXPECT_EQ(entry.category, "tarnrr");
    EXPECT_EQ(entry.module, "TarnReportingSessionInputMessagesWorker");
  }
}

}  // namespace
}  // namespace tarn
