// SPDX-License-Identifier: Apache-2.0
// In which order a session writes its lines, marks its trace points and changes, and from where it may be called.
#include <functional>
#include <thread>

#include "platform/Log.h"
#include "platform/TracePoints.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

// Writes down each line and each trace point, with what the test then sees of the session.
class Witness final : public platform::Log, public platform::TracePoints {
 public:
  Witness() noexcept { setThreshold(platform::LogLevel::Debug); }
  void write(const platform::LogEntry& entry) noexcept override { note(std::string(entry.text)); }
  void emit(std::uint32_t, std::int64_t) noexcept override { note("trace point"); }

  std::function<std::string()> seen;
  std::vector<std::string> moments;

 private:
  // Lines by what comes after their prefix.
  void note(const std::string& text) {
    for (const char* const known :
         {"created", "deallocing", "start called", "stop called", "ending", "marking", "trace point"}) {
      if (text.find(known) != std::string::npos) {
        moments.push_back(known + (seen ? seen() : std::string()));
      }
    }
  }
};

class SessionMoments : public SessionFixture {
 protected:
  using Moments = std::vector<std::string>;

  SessionMoments() {
    TarnReportingInstallFacilities(&facilities_);
    useWorkers({});
  }
  ~SessionMoments() override { installAnew(); }

  static std::string count(const std::shared_ptr<TarnReportingSession>& session) {
    return " " + std::to_string(session->messages().size());
  }
  Moments take() { return std::exchange(witness_.moments, {}); }

  Witness witness_;

 private:
  platform::Facilities facilities_{platform_.clock,
                                   platform_.workQueues,
                                   platform_.conditions,
                                   witness_,
                                   witness_,
                                   platform_.deviceProperties,
                                   platform_.defaults,
                                   platform_.notifications,
                                   platform_.processFacts,
                                   platform_.processControl,
                                   platform_.tally,
                                   platform_.fileSystem,
                                   platform_.localCalendar,
                                   platform_.randomSource,
                                   platform_.processEnvironment,
                                   platform_.commandRunner};
};

TEST_F(SessionMoments, LineOfEachPeriodComesBeforeItsTracePoint) {
  auto session = makeSession();
  EXPECT_EQ(take(), (Moments{"created", "trace point"}));
  session->start();
  EXPECT_EQ(take(), (Moments{"start called", "trace point"}));
  session->stop();
  EXPECT_EQ(take(), (Moments{"stop called", "ending", "trace point"}));
  session.reset();
  EXPECT_EQ(take(), (Moments{"deallocing", "trace point"}));
}

TEST_F(SessionMoments, MarkerIsInTheLogWhenTheCallIsTold) {
  const auto session = makeSession();
  take();
  witness_.seen = [&] { return count(session); };
  session->start();
  EXPECT_EQ(take(), (Moments{"start called 1", "trace point 1"}));
  session->stop();
  EXPECT_EQ(take(), (Moments{"stop called 2", "ending 2", "trace point 2"}));
  witness_.seen = nullptr;
}

TEST_F(SessionMoments, MessageHasItsApplicationAtItsTracePointAndItsFlagWhenItIsCompared) {
  const auto session = makeSession();
  session->start();
  take();
  std::shared_ptr<TarnReportingSessionMessage> record;
  witness_.seen = [&] {
    return std::string(record->message().contains("HostApplicationDisplayID") ? " named" : "") +
           (record->isSessionStarted() ? " started" : "");
  };
  for (int i = 0; i < 2; ++i) {
    record = message({{"tarnreporting_timestamp", now()}});
    session->sendMessage(record);
  }
  EXPECT_EQ(take(), (Moments{"trace point named", "trace point named", "marking named started"}));
  witness_.seen = nullptr;
}

TEST_F(SessionMoments, MarkerIsStampedBeforeItIsTagged) {
  const auto session = makeSession();
  session->start();
  std::string order;
  for (const auto& entry : session->messages().at(0)->message()) {
    order += std::string(entry.key.text()) + " ";
  }
  EXPECT_EQ(order,
            "method messages_at_start unique_messages_at_start reporterid running_at_start invalid_timestamp "
            "tarnreporting_timestamp audiotag ");
}

class SessionOutsideItsQueue : public SessionFixture {
 protected:
  template <class Call>
  static void onAThread(const Call& call) {
    std::thread(call).join();
  }
  static constexpr const char* kComplaint = "code of the server queue was called outside it";
};

TEST_F(SessionOutsideItsQueue, MakingOneEndsTheProcess) {
  EXPECT_DEATH(onAThread([] { makeSession(); }), kComplaint);
}

TEST_F(SessionOutsideItsQueue, StartEndsTheProcess) {
  const auto session = makeSession();
  EXPECT_DEATH(onAThread([&] { session->start(); }), kComplaint);
}

TEST_F(SessionOutsideItsQueue, StopEndsTheProcess) {
  const auto session = makeSession();
  EXPECT_DEATH(onAThread([&] { session->stop(); }), kComplaint);
}

TEST_F(SessionOutsideItsQueue, SettingTheServiceTypeEndsTheProcess) {
  const auto session = makeSession();
  EXPECT_DEATH(onAThread([&] { session->setServiceType(AudioServiceType::Wisp); }), kComplaint);
}

TEST_F(SessionOutsideItsQueue, UpdatingTheConfigurationEndsTheProcess) {
  const auto session = makeSession();
  const plist::Dictionary configuration{{"a", 1}};
  EXPECT_DEATH(onAThread([&] { session->updateConfigurationWithContentsOfConfiguration(&configuration); }), kComplaint);
}

}  // namespace
}  // namespace tarn
