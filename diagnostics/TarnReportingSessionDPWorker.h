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

class TarnReportingSessionDPWorker : public TarnReportingSessionWorkerProtocol,
                                     public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionDPWorker";
  // Half of the least time between two requests: however large the setting, the queue serves clients in between.
  static constexpr std::chrono::seconds kLongestWait{5};

  static std::unique_ptr<TarnReportingSessionDPWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  bool start() { return true; }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;
  // Whether the message is an overload; logs a yes.
  static bool interestedInMessage(const TarnReportingSessionMessage& message);

  // The suite of the settings, one for the process.
  static const TarnReportingDiagnosticDefaults& getUserDefaults();
  // A setting of the suite, logged when there is one; false or 0 without.
  static bool getEnableFlag(std::string_view key);
  static std::int32_t getRunTimeDefaults(std::string_view key);
  static double getDoubleRunTimeDefaults(std::string_view key);

 private:
  // Whether the overload counts and its moment allows a request.
  bool meetsConditions(const plist::Dictionary& payload, double now) const;
  static void dropGyre(const plist::Dictionary& payload);

  double lastMessageTime_ = 0;  // epoch seconds of the last request; 0: none yet
};

}  // namespace tarn
