// SnareService: the automatic bug capture of the device. A reporter asks it for a snapshot of the logs, or for a
// capture that runs for a while and can be cancelled.
//
// Threads: requests on the server queue; replies on a thread of the service's own, at any time, also when whoever asked
// is gone. A well-behaved service replies once to an accepted request; a handler must bear more replies and none.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/UniqueFunction.h"
#include "plist/Dictionary.h"

namespace tarn::platform {

struct SnareSignature {
  std::string domain;
  std::string type;
  std::string subType;
  std::string subTypeContext;
  std::optional<std::string> detectedProcess;
  std::optional<plist::Dictionary> triggerThresholdValues;
};

// The keys of a signature in its dictionary form; those of absent fields are left out.
struct SnareSignatureKeys {
  static constexpr std::string_view kDomain = "domain";
  static constexpr std::string_view kType = "type";
  static constexpr std::string_view kSubType = "subType";
  static constexpr std::string_view kSubTypeContext = "subTypeContext";
  static constexpr std::string_view kDetectedProcess = "detectedProcess";
  static constexpr std::string_view kTriggerThresholdValues = "triggerThresholdValues";
};

// The keys of a reply; each may be missing.
struct SnareReplyKeys {
  static constexpr std::string_view kSuccess = "success";                      // a bool
  static constexpr std::string_view kSessionIdentifier = "sessionIdentifier";  // a text
  static constexpr std::string_view kReasonCode = "reasonCode";                // an integer, of SnareReason
};

// The payload's key for what the diagnostic extensions are told.
inline constexpr std::string_view kSnareDiagnosticExtensionParametersKey = "diagnosticExtensionParameters";

enum class SnareReason : std::int32_t {
  None,
  ServiceNotReady,
  NotSupported,
  ServiceUnavailable,
  ServiceInterrupted,
  InvalidParameters,
  DailyLimitExceeded,
  RandomizedSuppression,
  SessionNotFound,
  RequestThrottled,
};
// Their names, by their numbers.
inline constexpr std::array<std::string_view, 10> kSnareReasonNames{"None",
                                                                    "ServiceNotReady",
                                                                    "NotSupported",
                                                                    "ServiceUnavailable",
                                                                    "ServiceInterrupted",
                                                                    "InvalidParameters",
                                                                    "DailyLimitExceeded",
                                                                    "RandomizedSuppression",
                                                                    "SessionNotFound",
                                                                    "RequestThrottled"};

// What a reporter is asked for. `event`, `events` and `actions` of the service are none in all of our requests.
struct SnareRequest {
  plist::Dictionary signature;
  double durationSeconds = 0;
  std::optional<plist::Dictionary> payload;
};

class SnareReporter {
 public:
  // The reply is a dictionary with the keys of SnareReplyKeys, or none.
  using ReplyHandler = UniqueFunction<void(const std::optional<plist::Dictionary>& reply)>;

  virtual ~SnareReporter() = default;
  // The dictionary form of a signature.
  virtual plist::Dictionary makeSignature(const SnareSignature& signature) = 0;
  // Asks for a snapshot; whether the request was accepted. Of one that was not, the handler is dropped uncalled.
  [[nodiscard]] virtual bool requestSnapshot(const SnareRequest& request, ReplyHandler reply) = 0;
  // Starts a capture that completes after its duration unless it is cancelled; accepted as above.
  [[nodiscard]] virtual bool startSession(const SnareRequest& request, ReplyHandler reply) = 0;
  // Cancels a capture by the identifier that its reply gave. One that isn't known is ignored.
  virtual void cancelSession(std::string_view sessionIdentifier) = 0;
};

class SnareService {
 public:
  virtual ~SnareService() = default;
  // A new reporter, never null. A request lives on when its reporter is gone.
  virtual std::shared_ptr<SnareReporter> createReporter() = 0;
};

}  // namespace tarn::platform
