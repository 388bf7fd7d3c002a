// SPDX-License-Identifier: Apache-2.0
// A session in this process, and messages for it. It needs a SessionPlatform.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "session/TarnReportingSession.h"

namespace tarn::bench {

// A running session.
std::shared_ptr<TarnReportingSession> makeSession(AudioServiceType serviceType = AudioServiceType::Generic);

class Feeder {
 public:
  static constexpr std::size_t kWindow = 1000;  // messages that are measured together

  explicit Feeder(TarnReportingSession& session, AudioEventType type = AudioEventType::Start)
      : session_(session), request_(makeRequest()), type_(type) {}

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
  const AudioEventType type_;
  std::uint64_t number_ = 0;
};

}  // namespace tarn::bench
