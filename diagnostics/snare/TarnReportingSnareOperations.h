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

class TarnReportingSnareOperations {
 public:
  // What stands for the identifier of a capture that the service didn't begin or didn't name.
  static constexpr const char* kNoneReturned = "NONE_RETURNED";

  // The identifier of the capture that a reply tells of, as text, or kNoneReturned. Logs what the reply says.
  static std::string getSessionIdentifierFromResponse(const std::optional<plist::Dictionary>& response);

  // The reporter's form of the signature by which captures of one fault are known: the service name, the message's
  // category and type, and the process, when there is one.
  static plist::Dictionary signatureFromMessage(const TarnReportingSessionMessage& message,
                                                AudioServiceType audioServiceType,
                                                platform::SnareReporter& symptomReporter,
                                                std::optional<std::string> clientProcessName);

  // What a snapshot carries: the session's processes, to which the captured system logs are narrowed down.
  static plist::Dictionary diagnosticPayload(const TarnReportingSession& session);
};

}  // namespace tarn
