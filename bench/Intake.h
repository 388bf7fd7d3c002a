// Sessions in this process, with the real workers and an analytics service that wants nothing, and messages for them.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "platform/Facilities.h"
#include "platform/TallyService.h"
#include "platform/TracePoints.h"
#include "platform/linux/LinuxClock.h"
#include "platform/linux/LinuxSignposts.h"
#include "platform/testing/FakePlatform.h"
#include "session/TarnReportingSession.h"

namespace tarn::bench {

// The platform of the tests, but for the facilities that a message meets: the fakes note down everything.
class IntakePlatform {
 public:
  IntakePlatform();
  linux_host::LinuxSignposts& signposts() { return signposts_; }

 private:
  class NoTally final : public platform::TallyService {
   public:
    bool eventIsInUse(std::string_view) override { return false; }
    void sendEventLazy(std::string_view, PayloadCallback) override {}
  };
  class NoTracePoints final : public platform::TracePoints {
   public:
    void emit(std::uint32_t, std::int64_t) noexcept override {}
  };

  testing::FakePlatform fakes_;
  linux_host::LinuxClock clock_;
  NoTally tally_;
  NoTracePoints tracePoints_;
  linux_host::LinuxSignposts signposts_{clock_};
  const platform::Facilities facilities_;
};

// A running session of the type "generic".
std::shared_ptr<TarnReportingSession> makeSession();

class Feeder {
 public:
  static constexpr std::size_t kWindow = 1000;  // messages that are measured together

  explicit Feeder(TarnReportingSession& session) : session_(session), request_(makeRequest()) {}

  void fillTo(std::size_t length) {
    while (session_.messages().size() < length) {
      session_.sendMessage(makeRecord());
    }
  }
  // Nanoseconds a message of the next ones, which are made beforehand; `send` hands one to the session.
  template <class Send>
  double measure(const Send& send) {
    std::vector<TarnReportingSession::MessagePointer> records;
    for (std::size_t i = 0; i < kWindow; ++i) {
      records.push_back(makeRecord());
    }
    return nanosecondsEach(kWindow, [&](std::size_t i) { send(session_, records[i]); });
  }
  double measure() {
    return measure([](TarnReportingSession& session, const auto& record) { session.sendMessage(record); });
  }

 private:
  TarnReportingSession::MessagePointer makeRecord();

  TarnReportingSession& session_;
  wire::Request request_;
  std::uint64_t number_ = 0;
};

}  // namespace tarn::bench
