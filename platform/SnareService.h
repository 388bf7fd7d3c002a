// SPDX-License-Identifier: Apache-2.0
// SnareService: the automatic bug capture of the device. A reporter asks it for a snapshot of the logs, or for a
// capture that runs for a while and can be cancelled.
//
//   createReporter() -> makeSignature() -> requestSnapshot(), or startSession() ... cancelSession(identifier)
//                                          '-> reply: {success, sessionIdentifier or reasonCode}
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

// What a capture is about, from the general to the particular. Texts are UTF-8.
struct SnareSignature {
  // Which part of the system, what kind of fault, which of the kind, in which circumstances.
  std::string domain;
  std::string type;
  std::string subType;
  std::string subTypeContext;
  // The process in which it was seen, where that is known.
  std::optional<std::string> detectedProcess;
  // The numbers by which it was taken for a fault.
  std::optional<plist::Dictionary> triggerThresholdValues;
};

// The keys of a signature in its dictionary form; those of absent fields are left out. Named as the fields.
struct SnareSignatureKeys {
  static constexpr std::string_view kDomain = "domain";
  static constexpr std::string_view kType = "type";
  static constexpr std::string_view kSubType = "subType";
  static constexpr std::string_view kSubTypeContext = "subTypeContext";
  static constexpr std::string_view kDetectedProcess = "detectedProcess";
  static constexpr std::string_view kTriggerThresholdValues = "triggerThresholdValues";
};

// The keys of a reply; each may be missing, so a reader asks for the kind that it wants.
struct SnareReplyKeys {
  static constexpr std::string_view kSuccess = "success";  // a bool
  // Only with success: what cancelSession() wants.
  static constexpr std::string_view kSessionIdentifier = "sessionIdentifier";  // a text
  // Only without success.
  static constexpr std::string_view kReasonCode = "reasonCode";  // an integer, of SnareReason
};

// The payload's key for what the diagnostic extensions are told: a dictionary by the extension's name.
inline constexpr std::string_view kSnareDiagnosticExtensionParametersKey = "diagnosticExtensionParameters";

// Why the service refuses. The numbers are the service's, from 0.
enum class SnareReason : std::int32_t {
  None,
  // The service itself: starting up, without such captures, gone, or cut short.
  ServiceNotReady,
  NotSupported,
  ServiceUnavailable,
  ServiceInterrupted,
  // The request: not in order, too many today, left out by chance, or about a session that it doesn't know.
  InvalidParameters,
  DailyLimitExceeded,
  RandomizedSuppression,
  SessionNotFound,
  // Too soon after the one before.
  RequestThrottled,
};
// Their names, by their numbers: for log lines and for the configuration.
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
  // As makeSignature() made it.
  plist::Dictionary signature;
  // How long a capture runs; a snapshot has 0.
  double durationSeconds = 0;
  // What the capture carries with it.
  std::optional<plist::Dictionary> payload;
};

// Who asks for captures. Owned by whoever made it.
class SnareReporter {
 public:
  // The reply is a dictionary with the keys of SnareReplyKeys, or none. It comes on a thread of the service's own, so a
  // handler hands over to a queue.
  using ReplyHandler = UniqueFunction<void(const std::optional<plist::Dictionary>& reply)>;

  virtual ~SnareReporter() = default;
  // The dictionary form of a signature, which requests carry. Asks nobody.
  virtual plist::Dictionary makeSignature(const SnareSignature& signature) = 0;
  // Asks for a snapshot; whether the request was accepted. Of one that was not, the handler is dropped uncalled.
  [[nodiscard]] virtual bool requestSnapshot(const SnareRequest& request, ReplyHandler reply) = 0;
  // Starts a capture that completes after its duration unless it is cancelled; accepted as above.
  [[nodiscard]] virtual bool startSession(const SnareRequest& request, ReplyHandler reply) = 0;
  // Cancels a capture by the identifier that its reply gave. One that isn't known is ignored.
  virtual void cancelSession(std::string_view sessionIdentifier) = 0;
};

// Owned by the platform, which may lack it.
class SnareService {
 public:
  virtual ~SnareService() = default;
  // A new reporter, never null. A request lives on when its reporter is gone.
  virtual std::shared_ptr<SnareReporter> createReporter() = 0;
};

}  // namespace tarn::platform
