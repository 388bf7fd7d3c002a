// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/snare/TarnReportingSnareOperations.h"

#include <utility>

#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

// They are the worker's operations, and its name is what people look for.
constexpr TarnReportingLogger kLog{TarnReportingSnareLogCategory, "TarnReportingSessionSnareWorker"};

void logReason(std::int64_t code) {
  constexpr auto kReasons = static_cast<std::int64_t>(platform::kSnareReasonNames.size());
  if (code < 0 || code >= kReasons) {
    kLog(LogLevel::Info, "Failed starting snare session. reason=%d", code);
    return;
  }
  // A failure without a reason is the service's own fault.
  const bool isNone = code == static_cast<std::int64_t>(platform::SnareReason::None);
  kLog(isNone ? LogLevel::Error : LogLevel::Info, "Failed starting snare session. reason=kAilmentError%@",
       platform::kSnareReasonNames[static_cast<std::size_t>(code)]);
}

}  // namespace

std::string TarnReportingSnareOperations::getSessionIdentifierFromResponse(
    const std::optional<plist::Dictionary>& response) {
  using Keys = platform::SnareReplyKeys;
  const plist::Dictionary reply = response.value_or(plist::Dictionary());
  if (reply.get(Keys::kSuccess) == plist::ValueView(true)) {
    const plist::ValueView identifier = reply.get(Keys::kSessionIdentifier);
    if (!identifier) {
      kLog(LogLevel::Error, "Started Snare session, but no sessionId found!");
      return kNoneReturned;
    }
    kLog(LogLevel::Info, "Started Snare session. sessionId=%@", identifier);
    return identifier.asText();
  }
  if (const plist::ValueView reason = reply.get(Keys::kReasonCode)) {
    logReason(reason.asInt64());
  } else {
    kLog(LogLevel::Error, "Failed starting snare session. Unknown reason.");
  }
  return kNoneReturned;
}

plist::Dictionary TarnReportingSnareOperations::signatureFromMessage(const TarnReportingSessionMessage& message,
                                                                     AudioServiceType audioServiceType,
                                                                     platform::SnareReporter& symptomReporter,
                                                                     std::optional<std::string> clientProcessName) {
  return symptomReporter.makeSignature(
      {.domain = "AudioAnalytics",
       .type = std::string(TarnReportingUtilityGenerateServiceNameFromServiceType(audioServiceType)),
       .subType = TarnReportingUtilityCategoryString(message.category()),
       .subTypeContext = std::string(TarnReportingUtilityTypeString(message.type())),
       .detectedProcess = std::move(clientProcessName),
       .triggerThresholdValues = std::nullopt});
}

plist::Dictionary TarnReportingSnareOperations::diagnosticPayload(const TarnReportingSession& session) {
  plist::Array processIDs;
  for (const std::int32_t identifier : session.processIdentifiers()) {
    processIDs.append(identifier);
  }
  const plist::Dictionary filter{{"processIDs", processIDs}};
  const plist::Dictionary parameters{{"sys.oxbow.WattlogCore.VetchSysLogFilterProcess", filter}};
  return {{platform::kSnareDiagnosticExtensionParametersKey, parameters}};
}

}  // namespace tarn
