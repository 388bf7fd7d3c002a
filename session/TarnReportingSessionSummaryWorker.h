// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionSummaryWorker: counts a session's activity and, when the session stops, sends one summary message
// back into it, where the consumers that still run get it like any client's message.
//
// The counters are not reset at stop: the summary of a session that is started again covers its whole life.
//
// A message with "session_duration" (seconds) counts as one activity of that length; any other one whose "issue_type"
// is "overload" as an overload. Redundant messages aren't looked at. The summary is of the category SessionGeneric and
// the type Summary.
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "plist/Dictionary.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// As a producer it stops ahead of all consumers; as a consumer it starts with them.
class TarnReportingSessionSummaryWorker : public TarnReportingSessionWorkerProtocol,
                                          public TarnReportingSessionWorkerConsumerProtocol,
                                          public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionSummaryWorker";

  // For every session. Single-message sessions never have one: the class doesn't declare that it may run there.
  static std::unique_ptr<TarnReportingSessionSummaryWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // True.
  bool start();
  // Sends the summary: active time and counts from here, message counts from the session as they are in that moment,
  // names of service, client and application, and the machine's thermal state, low-power mode, load and this process's
  // memory in whole MiB. The log then holds the two markers, and the total has what producers derived before this one's
  // turn; the counts are told as they are read. Memory that can't be read is left out and told with an error line. The
  // summary is handed to the session's intake like any message, so it is stamped and logged too.
  void stop();
  // Counts; it changes nothing of the record.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;

 private:
  // The payload of the summary, before the intake adds to it.
  plist::Dictionary summary(const TarnReportingSession& session) const;

  // Of the last message that had neither key of those that are counted: the next one's, mostly.
  plist::KeyList keysWithout_;
  double totalActiveTime_ = 0;  // seconds, the sum of "session_duration"
  std::uint32_t activeCount_ = 0;
  std::uint32_t overloadCount_ = 0;
};

}  // namespace tarn
