// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionDPWorker: answers an audio I/O overload with a request for a gyre, a stack-sampling trace of the
// whole device, so that the cause of the overload can be studied.
//
// It applies to internal builds where the setting "enable_gyre" is on and the device has the service. Three settings
// tune it: the least buffer size and I/O cycle of an overload that counts, and how long to wait before the request.
// They belong to the process: the reading of the worker made last holds for all. A worker asks at most once in 10
// seconds.
//
// The wait blocks the server queue on purpose, so that the trace shows what comes after the overload. It is held to
// kLongestWait.
//
// A request names the subsystem "sys.oxbow.tarnkit", the reason "AudioOverloads" and the application of the message,
// and carries the message's payload. Afterwards "sys.oxbow.tarnkit.dropped-gyre" is posted, for whoever collects the
// traces.
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingDiagnosticDefaults;

namespace plist {
class Dictionary;
}

// Not in single-message sessions, and not before the session's start.
class TarnReportingSessionDPWorker : public TarnReportingSessionWorkerProtocol,
                                     public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionDPWorker";
  // Half of the least time between two requests: however large the setting, the queue serves clients in between.
  static constexpr std::chrono::seconds kLongestWait{5};

  // Reads the settings: "enable_gyre", "io_buffer_size" (frames; 512 when it is not set or 0), "io_cycle" (0 when it is
  // not set) and "wait_time" (microseconds; what isn't above 0 is no wait).
  static std::unique_ptr<TarnReportingSessionDPWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // What applies runs.
  bool start() { return true; }
  // An overload whose "smallest_buffer_frame_size" and "io_cycle" are at least those of the settings, more than 10
  // seconds after the last request of this worker, waits and asks. A message without the two counts as 0 in both.
  // Everything else has a line at debug level that tells the two and the time; it is formed only when that level is on.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;
  // Whether the message is an overload; logs a yes. An overload is a message of the category IO, without a domain, and
  // of the type Error.
  static bool interestedInMessage(const TarnReportingSessionMessage& message);

  // The suite of the settings, one for the process.
  static const TarnReportingDiagnosticDefaults& getUserDefaults();
  // A setting of the suite, logged when there is one; false or 0 without. Numbers are read from any kind of value; what
  // doesn't fit 32 bits is held to their range.
  static bool getEnableFlag(std::string_view key);
  static std::int32_t getRunTimeDefaults(std::string_view key);
  static double getDoubleRunTimeDefaults(std::string_view key);

 private:
  // Whether the overload counts and its moment allows a request.
  bool meetsConditions(const plist::Dictionary& payload, double now) const;
  // Waits, asks for the trace and posts the notification, in this order. The moment of the request is taken before the
  // wait.
  static void dropGyre(const plist::Dictionary& payload);

  double lastMessageTime_ = 0;  // epoch seconds of the last request; 0: none yet
};

}  // namespace tarn
