// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeRtcReportingService.h"

#include <mutex>
#include <utility>

#include "testing/backends/RecordingSessionRecords.h"

namespace tarn::testing {

struct FakeRtcReportingService::Ledger {
  std::mutex mutex;
  bool handsOutTokens = true;
  bool makesSessions = true;
  std::optional<std::vector<std::string>> backends{std::vector<std::string>{"fake"}};
  std::optional<platform::RtcReportingSession::SendResult> refusal;
  std::size_t tokens = 0;
  std::vector<Session> sessions;
  ReplyFaults completions;
};

class FakeRtcReportingService::FakeSession final : public platform::RtcReportingSession {
 public:
  FakeSession(std::shared_ptr<Ledger> ledger, std::size_t index) : ledger_(std::move(ledger)), index_(index) {}
  ~FakeSession() override {
    const std::lock_guard lock(ledger_->mutex);
    ledger_->sessions[index_].released = true;
  }
  FakeSession(const FakeSession&) = delete;
  FakeSession& operator=(const FakeSession&) = delete;

  void startConfiguration(StartCompletion completion) override {
    std::optional<std::vector<std::string>> backends;
    {
      const std::lock_guard lock(ledger_->mutex);
      ++ledger_->sessions[index_].starts;
      backends = ledger_->backends;
    }
    ledger_->completions.deliver(
        [completion = std::move(completion), backends = std::move(backends)]() mutable { completion(backends); });
  }

  SendResult sendMessage(std::uint16_t category, std::uint16_t type, const plist::Dictionary& payload) override {
    const std::lock_guard lock(ledger_->mutex);
    auto& session = ledger_->sessions[index_];
    ++session.attempts;
    if (ledger_->refusal) return *ledger_->refusal;
    session.messages.push_back({category, type, payload, RecordingSessionRecords::current()});
    return {true, {}};
  }

  void flushMessages() override {
    const std::lock_guard lock(ledger_->mutex);
    auto& session = ledger_->sessions[index_];
    ++session.flushes;
    session.messagesAtLastFlush = session.messages.size();
  }

  std::string description() const override { return "fake session " + std::to_string(index_ + 1); }

 private:
  const std::shared_ptr<Ledger> ledger_;
  const std::size_t index_;
};

FakeRtcReportingService::FakeRtcReportingService() : ledger_(std::make_shared<Ledger>()) {}

// Here, not with the ledger: a completion that runs may hold the last session, and a thread can't wait for itself.
FakeRtcReportingService::~FakeRtcReportingService() {
  ledger_->completions.joinThreads();
}

std::optional<std::string> FakeRtcReportingService::newHierarchyToken(const std::optional<std::string>&) {
  const std::lock_guard lock(ledger_->mutex);
  if (!ledger_->handsOutTokens) return std::nullopt;
  return "token-" + std::to_string(++ledger_->tokens);
}

std::shared_ptr<platform::RtcReportingSession> FakeRtcReportingService::createSession(
    const plist::Dictionary& sessionInfo, const plist::Dictionary& userInfo,
    const std::optional<std::vector<std::string>>& frameworksToCheck) {
  const std::lock_guard lock(ledger_->mutex);
  if (!ledger_->makesSessions) return nullptr;
  Session session;
  session.sessionInfo = sessionInfo;
  session.userInfo = userInfo;
  session.frameworksToCheck = frameworksToCheck;
  ledger_->sessions.push_back(std::move(session));
  return std::make_shared<FakeSession>(ledger_, ledger_->sessions.size() - 1);
}

void FakeRtcReportingService::setHandsOutTokens(bool handsOut) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->handsOutTokens = handsOut;
}

void FakeRtcReportingService::setMakesSessions(bool makes) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->makesSessions = makes;
}

void FakeRtcReportingService::setBackends(std::optional<std::vector<std::string>> backends) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->backends = std::move(backends);
}

void FakeRtcReportingService::refuseMessages(std::optional<platform::RtcReportingSession::SendResult> failure) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->refusal = std::move(failure);
}

ReplyFaults& FakeRtcReportingService::completions() {
  return ledger_->completions;
}

std::vector<FakeRtcReportingService::Session> FakeRtcReportingService::sessions() const {
  const std::lock_guard lock(ledger_->mutex);
  return ledger_->sessions;
}

std::size_t FakeRtcReportingService::tokens() const {
  const std::lock_guard lock(ledger_->mutex);
  return ledger_->tokens;
}

}  // namespace tarn::testing
