// SPDX-License-Identifier: Apache-2.0
// Replies of the capture service that are late, never come, come twice, or come when nobody is left.
#include "tests/diagnostics/snare/SnareFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;

class SnareReplyFault : public SnareFixture {
 protected:
  static constexpr std::string_view kAlarmStarted =
      "Started Snare session for alarm Low RMS. sessionId=capture-1 timeout=60.000000 "
      "response={success = 1; sessionIdentifier = capture-1}";
};

TEST_F(SnareReplyFault, AReplyThatNeverComesLeavesNothingToCancel) {
  platform_.snare.replies().set(ReplyFault::Drop);
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  session->stop();
  EXPECT_EQ(calls().size(), 1U);
  EXPECT_FALSE(session->started());
}

TEST_F(SnareReplyFault, AReplyBehindTheStopIsKeptForTheNextStop) {
  platform_.snare.replies().set(ReplyFault::Hold);
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  session->stop();
  EXPECT_EQ(calls().size(), 1U);
  platform_.snare.replies().deliverHeld();
  EXPECT_TRUE(logged(LogLevel::Info, kAlarmLowRMS, kAlarmStarted));
  session->start();
  session->stop();
  ASSERT_EQ(calls().size(), 2U);
  EXPECT_EQ(calls()[1].cancelledIdentifier, "capture-1");
}

TEST_F(SnareReplyFault, AReplyBehindTheEndOfTheSessionIsLogged) {
  platform_.snare.replies().set(ReplyFault::Hold);
  Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  const std::weak_ptr<TarnReportingSession> gone = session;
  session.reset();
  EXPECT_TRUE(gone.expired());  // the reply that is awaited keeps nothing alive
  EXPECT_EQ(platform_.snare.replies().deliverHeld(), 1U);
  EXPECT_TRUE(logged(LogLevel::Info, kAlarmLowRMS, kAlarmStarted));
}

TEST_F(SnareReplyFault, AReplyInAnotherInstallationIsLogged) {
  platform_.snare.replies().set(ReplyFault::Hold);
  Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  session.reset();
  installAnew();
  EXPECT_EQ(platform_.snare.replies().deliverHeld(), 1U);
  EXPECT_TRUE(platform_.log.contains("Started Snare session for system sound server leaks. sessionId=capture-1"));
}

TEST_F(SnareReplyFault, AReplyThatComesTwiceSaysTheSameTwice) {
  platform_.snare.replies().set(ReplyFault::Twice);
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  EXPECT_EQ(platform_.log.count("Started Snare session for alarm Low RMS."), 2U);
  session->stop();
  EXPECT_EQ(calls().size(), 2U);
}

TEST_F(SnareReplyFault, ALateReplyIsTakenWhenItComes) {
  const auto queue = platform_.workQueues.makeSerialQueue("capture", platform::QualityOfService::Utility);
  platform_.snare.replies().delayOn(queue, 5s);
  const Session session = startedSession(AudioServiceType::Haptics);
  session->sendMessage(hapticLeak(1));
  session->sendMessage(hapticLeak(2));
  EXPECT_FALSE(stateOf(session, kHapticLeaks).currentSnareSessionIdentifier->get());
  platform_.advance(5s);
  EXPECT_EQ(stateOf(session, kHapticLeaks).currentSnareSessionIdentifier->get(), "capture-1");
}

TEST_F(SnareReplyFault, ALateReplyOfAnEarlierFireReplacesALaterOne) {
  platform_.snare.replies().set(ReplyFault::Hold);
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  platform_.snare.replies().set(ReplyFault::None);
  platform_.advance(15s);
  session->sendMessage(stuckSound(2));
  EXPECT_EQ(stateOf(session, kSSSLeaks).currentSnareSessionIdentifier->get(), "capture-2");
  platform_.snare.replies().deliverHeld();
  EXPECT_EQ(stateOf(session, kSSSLeaks).currentSnareSessionIdentifier->get(), "capture-1");
}

TEST_F(SnareReplyFault, RepliesThatHoldNothingAreLogged) {
  platform_.snare.replyNextWith(std::nullopt);
  platform_.snare.replyNextWith(plist::Dictionary{});
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  platform_.advance(15s);
  session->sendMessage(stuckSound(2));
  EXPECT_TRUE(logged(LogLevel::Info, kSSSLeaks,
                     "Started Snare session for system sound server leaks. sessionId=NONE_RETURNED response=(null)"));
  EXPECT_TRUE(logged(LogLevel::Info, kSSSLeaks,
                     "Started Snare session for system sound server leaks. sessionId=NONE_RETURNED response={}"));
  EXPECT_EQ(platform_.log.count("Failed starting snare session. Unknown reason."), 2U);
}

TEST_F(SnareReplyFault, UnderEveryFaultTheSessionStopsAndNothingIsAskedTwice) {
  std::int64_t reporterID = 100;
  for (const ReplyFault fault :
       {ReplyFault::None, ReplyFault::Drop, ReplyFault::Hold, ReplyFault::Twice, ReplyFault::OtherThread}) {
    installAnew();
    platform_.snare.replies().set(fault);
    const std::size_t before = calls().size();
    Session session = startedSession(AudioServiceType::Alarms, ++reporterID);
    session->sendMessage(hapticLeak(1));
    session->sendMessage(hapticLeak(2));
    session->sendMessage(stuckSound(1));
    sendLowRms(session, 3);
    session->stop();
    EXPECT_FALSE(session->started());
    std::size_t asked = 0;
    const auto all = calls();
    for (std::size_t i = before; i < all.size(); ++i) {
      asked += all[i].kind == Kind::CancelSession ? 0U : 1U;
    }
    EXPECT_EQ(asked, 3U);
    session.reset();
    platform_.snare.replies().joinThreads();
    platform_.snare.replies().deliverHeld();
  }
}

TEST_F(SnareReplyFault, AReplyWithinTheRequestFindsNoLockHeldAgainstIt) {
  platform_.snare.replies().set(ReplyFault::None);  // on the queue's own thread, while the rate limit is held
  const Session session = startedSession(AudioServiceType::SystemSounds);
  session->sendMessage(stuckSound(1));
  EXPECT_EQ(stateOf(session, kSSSLeaks).currentSnareSessionIdentifier->get(), "capture-1");
}

}  // namespace
}  // namespace tarn
