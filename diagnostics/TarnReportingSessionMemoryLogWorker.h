// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionMemoryLogWorker: answers a message of type MemoryLog with what two memory tools of the device
// print, written to the log in numbered blocks, so that a problem of wired memory can be studied from the log alone.
//
// It applies to sessions of the service type "test", and to all sessions of an internal build. A request less than 5
// seconds after the last one, of whatever session, does nothing.
//
// Threads: the tools run at once, each on a queue of its own, while the server queue waits for both. Nothing there
// waits for the server queue in turn, and as that is one thread, no more than one request runs at a time.
//
// Bounds: a tool is ended after kToolTimeLimit, what it printed until then counts. No more than kMostBytesRead of its
// output are read and about kMostBytesKept kept; an error line tells when there was more. A block that a very long line
// makes longer than a log entry may be is several entries of one number. A tool that didn't come to its end within
// kPatience, as the platform's threads were busy, is left alone with an error line.
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// It runs from the session's creation on, but not in single-message sessions. Its lines have no module before them,
// since programs look for "wiredlog:" and "WIRED LOG BLOCK" at their beginning.
class TarnReportingSessionMemoryLogWorker : public TarnReportingSessionWorkerProtocol,
                                            public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionMemoryLogWorker";
  // A tool that takes longer counts as hanging.
  static constexpr std::chrono::seconds kToolTimeLimit{60};
  static constexpr std::chrono::seconds kPatience{75};  // well below the longest wait that a watchdog bears
  // A tool that prints without end is cut here, whether or not its lines are wanted.
  static constexpr std::size_t kMostBytesRead = std::size_t{16} << 20U;
  static constexpr std::size_t kMostBytesKept = std::size_t{1} << 20U;  // some two thousand log entries

  // Whether the device has the tools is seen only when they are started.
  static std::unique_ptr<TarnReportingSessionMemoryLogWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool startOnInit() { return true; }
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // A request repeats the one before word by word.
  bool handleRedundantMessages() { return true; }
  // Returns when both tools are through or given up; the zones' blocks are logged first, then those of the resources,
  // each tool's numbered from 1. Of the resources only the lines about memory and time are kept, without the tasks that
  // wire nothing. A tool that can't be executed has an error line and no block.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;
};

}  // namespace tarn
