// SPDX-License-Identifier: Apache-2.0
// FakeRtcReportingService: a real-time-communication backend that keeps what each session is given, and answers as it
// is told: with one backend named "fake" until a test says otherwise.
//
// Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/RtcReportingService.h"
#include "platform/SessionRecords.h"
#include "testing/backends/ReplyFaults.h"

namespace tarn::testing {

class FakeRtcReportingService final : public platform::RtcReportingService {
 public:
  struct Message {
    std::uint16_t category = 0;
    std::uint16_t type = 0;
    plist::Dictionary payload;
    platform::SessionNumber session = 0;  // whose work it was to send it
  };
  struct Session {
    plist::Dictionary sessionInfo;
    plist::Dictionary userInfo;
    std::optional<std::vector<std::string>> frameworksToCheck;
    std::vector<Message> messages;  // those that were sent
    std::size_t attempts = 0;       // the refused ones included
    std::size_t starts = 0;
    std::size_t flushes = 0;
    std::size_t messagesAtLastFlush = 0;
    bool released = false;  // nobody holds it any more
  };

  FakeRtcReportingService();
  ~FakeRtcReportingService() override;
  FakeRtcReportingService(const FakeRtcReportingService&) = delete;
  FakeRtcReportingService& operator=(const FakeRtcReportingService&) = delete;

  // The interface. Tokens are "token-1", "token-2" and so on.
  std::optional<std::string> newHierarchyToken(const std::optional<std::string>& parentToken) override;
  std::shared_ptr<platform::RtcReportingSession> createSession(
      const plist::Dictionary& sessionInfo, const plist::Dictionary& userInfo,
      const std::optional<std::vector<std::string>>& frameworksToCheck) override;

  // Controls.
  // Whether tokens are handed out, and whether sessions can be made.
  void setHandsOutTokens(bool handsOut);
  void setMakesSessions(bool makes);
  // What the start's completion reports; nothing: no list.
  void setBackends(std::optional<std::vector<std::string>> backends);
  // Messages fail like this; nothing: they are sent.
  void refuseMessages(std::optional<platform::RtcReportingSession::SendResult> failure);
  // How the start's completion comes.
  ReplyFaults& completions();

  // Observations.
  std::vector<Session> sessions() const;  // in the order in which they were made
  std::size_t tokens() const;             // handed out

 private:
  class FakeSession;
  struct Ledger;

  const std::shared_ptr<Ledger> ledger_;
};

}  // namespace tarn::testing
