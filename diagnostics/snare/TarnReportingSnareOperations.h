// SPDX-License-Identifier: Apache-2.0
// TarnReportingSnareOperations: the class operations of the Snare worker, in a place that its instances may know too:
// what a request to the capture service is made of, and what a reply says.
//
// Threads: getSessionIdentifierFromResponse on any; the others on the server queue.
#pragma once

#include <optional>
#include <string>

#include "platform/SnareService.h"
#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingVocabulary.h"

namespace tarn {

class TarnReportingSession;
class TarnReportingSessionMessage;

// Stateless.
class TarnReportingSnareOperations {
 public:
  // What stands for the identifier of a capture that the service didn't begin or didn't name. A text like any
  // identifier, so that readers of the log find one in either case.
  static constexpr const char* kNoneReturned = "NONE_RETURNED";

  // The identifier of the capture that a reply tells of, as text, or kNoneReturned. Logs what the reply says. Without a
  // reply, or with one that names no reason, the line is an error; a reason that the service gives is told at info
  // level, but for its own faults.
  static std::string getSessionIdentifierFromResponse(const std::optional<plist::Dictionary>& response);

  // The reporter's form of the signature by which captures of one fault are known: the service name, the message's
  // category and type, and the process, when there is one. The domain is always "AudioAnalytics".
  static plist::Dictionary signatureFromMessage(const TarnReportingSessionMessage& message,
                                                AudioServiceType audioServiceType,
                                                platform::SnareReporter& symptomReporter,
                                                std::optional<std::string> clientProcessName);

  // What a snapshot carries: the session's processes, to which the captured system logs are narrowed down. A property
  // list of the form that the service's extension for system logs reads.
  static plist::Dictionary diagnosticPayload(const TarnReportingSession& session);
};

}  // namespace tarn
