// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionTallyWorker: forwards every message of a session, as it arrives, to the analytics-event service,
// under two event names: one of the message's category and type, one with the session's service name before them.
//
// It runs everywhere: from the session's creation on, in single-message sessions, for every service type.
//
// The payload is the one that the intake left: stamped, tagged, without blanks in keys. Redundant messages aren't
// forwarded.
//
// Owner: the session. Threads: the server queue; the service may ask for the payload later, on a thread of its own.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>

#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// It has no start and no stop of its own: the session notes that it runs.
class TarnReportingSessionTallyWorker : public TarnReportingSessionWorkerProtocol,
                                        public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionTallyWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionTallyWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  // So messages that come before the session's start are reported too.
  static bool startOnInit() { return true; }
  static bool handleSingleMessageSession() { return true; }
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // For each of the two names, in this order: asks whether anybody wants the event, and hands the payload over only
  // then. A payload handed over is a share of the present one; what a producer changes later isn't in it.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;

 private:
  struct EventNames {
    std::string ofMessage;  // "sys.oxbow.tarnkit.%@.%@"
    std::string ofService;  // "sys.oxbow.%@.%@.%@"
  };
  // Made on first use and kept. The reference holds until the next call.
  const EventNames& namesFor(AudioServiceType serviceType, AudioEventCategory category, AudioEventType type);

  // The names of the few kinds of messages that a session sees over and over; cleared when a client floods it.
  static constexpr std::size_t kNamesLimit = 256;
  std::unordered_map<std::uint64_t, EventNames> names_;
};

}  // namespace tarn
