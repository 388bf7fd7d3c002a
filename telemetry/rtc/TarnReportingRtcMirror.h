// SPDX-License-Identifier: Apache-2.0
// TarnReportingRtcMirror: the session that an Rtc worker holds in the real-time-communication reporting service, and
// all that is done to it.
//
//   server queue        private queue                          a thread of the service
//   start       ------> token, session, start configuration --> completion: flags, signal
//   messages    ------> (suspended: signal or 9 seconds) <-----'
//   stop        ------> each sent, or dropped when nothing answered; then summary, flush, end
//
// Shared by the worker, its tasks and the completion, so that each may come when the others are gone: a worker that is
// released without a stop leaves what it handed over to be sent.
//
// Threads: rtcReportingQueue() the server queue (its first call comes before any task); the flags any; all else the
// private queue.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/RtcReportingService.h"
#include "platform/WorkQueue.h"
#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionMessage.h"
#include "telemetry/rtc/TarnReportingQueueSemaphore.h"
#include "telemetry/rtc/TarnReportingRtcSummary.h"

namespace tarn {

// One for each worker, for all of its session's periods. What waits on the private queue is bounded by the host, which
// slows clients down.
class TarnReportingRtcMirror : public std::enable_shared_from_this<TarnReportingRtcMirror> {
 public:
  using MessagePointer = std::shared_ptr<TarnReportingSessionMessage>;

  // The session as it was when it was started.
  struct Started {
    plist::Dictionary configuration;
    std::string serviceName;  // with its suffix
    AudioServiceType serviceType;
    std::int64_t reporterID;
    bool isSingleMessageSession;
  };
  // The session as it was when it was stopped.
  struct Stopped {
    TarnReportingRtcMessages messages;
    bool hadMessages;  // whether the log held any at all
    AudioServiceType serviceType;
    std::int64_t reporterID;
  };

  // The service outlives this. After so many bytes the summary event is cut.
  explicit TarnReportingRtcMirror(platform::RtcReportingService& service,
                                  std::size_t longestSummary = TarnReportingRtcSummary::kLongestText)
      : service_(service), longestSummary_(longestSummary) {}
  TarnReportingRtcMirror(const TarnReportingRtcMirror&) = delete;
  TarnReportingRtcMirror& operator=(const TarnReportingRtcMirror&) = delete;

  // The low 16 bits.
  static std::uint16_t retrieveRTCReportingCategoryFromCategory(AudioEventCategory category);
  // All but API usage, whose events are wanted as they happen.
  static bool shouldBatchRTCReportingEventsForServiceType(AudioServiceType serviceType);

  // Made on first use. Named "sys.oxbow.tarnkit.session.rtcreporting", of the utility quality.
  const std::shared_ptr<platform::SuspendableQueue>& rtcReportingQueue();

  // The worker's own flag: the session writes it at start and stop, a completion with a list sets it.
  bool started() const noexcept { return started_.load(); }
  void setStarted(bool started) noexcept { started_.store(started); }
  // Whether a start was handed over that has not asked for backends yet. A stop that comes in that time helps the start
  // along first.
  bool isStarting() const noexcept { return startsAhead_.load() != 0; }
  void setStarting() noexcept { ++startsAhead_; }
  // Whether its last start came to nothing and none is ahead: a message has nothing to wait for then.
  bool isInert() const noexcept { return isInert_.load() && !isStarting() && !rtcReportingSessionStarted(); }
  // What became of a message to one that has no session of the service.
  static void tellNeverStarted(std::string_view operation);
  // Whether a session of the service can be used.
  bool rtcReportingSessionStarted() const noexcept { return rtcReportingSessionStarted_.load(); }

  // The tasks, and what else is of the private queue. Asks the service for a token and a session and has it look for
  // backends, then suspends the queue until it answers, at most 9 seconds. Without a token there is an error line and
  // no wait; without an answer or a backend, what came meanwhile is dropped message by message, with a line each.
  void start(const Started& session);
  // Sends it when there is a session; else a line tells that none was started.
  void handleMessage(const MessagePointer& message);
  // Sends the summary, unless the log was empty, flushes and lets go of the service's session, which ends it. Without
  // one only a line tells so.
  void stop(const Stopped& session);

  // The service's token for the period that runs; nothing before its start and after its end.
  const std::optional<std::string>& rtcReportingAgentToken() const noexcept { return rtcReportingAgentToken_; }
  // Sends one message; outside internal builds its record loses the time stamp. Without a session of the service
  // nothing is sent.
  void _sendMessage(const MessagePointer& message);  // NOLINT(readability-identifier-naming): its given name

 private:
  using Backends = std::optional<std::vector<std::string>>;

  // Whether there is a token, and so an answer to wait for.
  bool open(const Started& session);
  // A list, be it empty, means that the session can be used. It may come after the wait was given up.
  void foundBackends(const Backends& backends);  // on the service's thread
  // Goes on with the session, or lets go of it.
  void endWait(bool signalled);
  // As one event of the category and type Unknown. A summary that was cut has an error line.
  void sendSummary(const Stopped& session);
  // Lets go of the service's session and of the token.
  void release();

  platform::RtcReportingService& service_;
  const std::size_t longestSummary_;
  std::atomic<bool> started_{false};
  std::atomic<bool> rtcReportingSessionStarted_{false};
  // Starts that were handed over and haven't run: on a busy machine a session may stop and start again before.
  std::atomic<int> startsAhead_{0};
  std::atomic<bool> isInert_{false};
  TarnReportingQueueSemaphore rtcreportingBackendSemaphore_;
  std::shared_ptr<platform::SuspendableQueue> rtcReportingQueue_;
  // Of the private queue.
  std::shared_ptr<platform::RtcReportingSession> rtcReportingSession_;
  std::optional<std::string> rtcReportingAgentToken_;
};

}  // namespace tarn
