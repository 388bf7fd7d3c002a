// SPDX-License-Identifier: Apache-2.0
// RtcReportingService: the service that gathers telemetry sessions of real-time communication from many processes.
//
//   newHierarchyToken() -> createSession() -> startConfiguration() -> sendMessage() ... -> flushMessages()
//
// Threads: the calls of one session come one at a time, from any thread; the start's completion comes within the
// call or on a thread of the service's own, at any time, also when whoever asked is gone.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/UniqueFunction.h"
#include "plist/Dictionary.h"
#include "plist/Result.h"

namespace tarn::platform {

// The keys of a session's `sessionInfo`: who reports, in which version, in which place of a hierarchy.
struct RtcSessionInfoKeys {
  // Who reports, as the service knows it, and the version of what that client sends.
  static constexpr std::string_view kClientType = "clientType";
  static constexpr std::string_view kClientVersion = "clientVersion";
  // The reporter ID, and whether events are held back to be sent in one go.
  static constexpr std::string_view kSessionID = "sessionID";
  static constexpr std::string_view kBatchEvent = "batchEvent";
  // The token of newHierarchyToken(), whether events are to go out at once, and the application that this is about.
  static constexpr std::string_view kHierarchyToken = "hierarchyToken";
  static constexpr std::string_view kContainsRealtimeEvents = "containsRealtimeEvents";
  static constexpr std::string_view kClientBundleID = "clientBundleID";
};

// The keys of its `userInfo`: the names of the client and of the service that it belongs to.
struct RtcUserInfoKeys {
  static constexpr std::string_view kClientName = "clientName";
  static constexpr std::string_view kServiceName = "serviceName";
};

// A session in the service. Letting go of it ends it there. Owned by one worker.
class RtcReportingSession {
 public:
  // The names of the available backends (maybe none of them), or no list at all.
  using StartCompletion = UniqueFunction<void(const std::optional<std::vector<std::string>>& backends)>;
  // What the service says of a message. Nothing is tried again.
  struct SendResult {
    // Whether the service took it.
    bool sent = false;
    Status error{};  // a message may fail without one
  };

  virtual ~RtcReportingSession() = default;
  // Looks for backends, and returns without waiting for them. A well-behaved service completes once; a handler must
  // bear more calls and none. Messages may be sent before, and may fail then.
  virtual void startConfiguration(StartCompletion completion) = 0;
  // Hands over a message of this category and type. The payload is taken as it is now.
  [[nodiscard]] virtual SendResult sendMessage(std::uint16_t category, std::uint16_t type,
                                               const plist::Dictionary& payload) = 0;
  // Pushes out events that are held back for batching.
  virtual void flushMessages() = 0;
  // For log lines; UTF-8.
  virtual std::string description() const = 0;
};

// Owned by the platform, which may lack it.
class RtcReportingService {
 public:
  virtual ~RtcReportingService() = default;
  // A token for a new place below `parentToken`, or at the top without one. Nothing when none is handed out.
  virtual std::optional<std::string> newHierarchyToken(const std::optional<std::string>& parentToken) = 0;
  // A new session; `frameworksToCheck` may be none. A null pointer when it can't be made.
  virtual std::shared_ptr<RtcReportingSession> createSession(
      const plist::Dictionary& sessionInfo, const plist::Dictionary& userInfo,
      const std::optional<std::vector<std::string>>& frameworksToCheck) = 0;
};

}  // namespace tarn::platform
