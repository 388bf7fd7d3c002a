// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeSnareService.h"

#include <cstdint>
#include <deque>
#include <mutex>
#include <utility>

namespace tarn::testing {

using platform::SnareReplyKeys;

struct FakeSnareService::Ledger : Recorded {
  using Recorded::happened;

  std::optional<plist::Dictionary> nextReply() {
    if (!scripted.empty()) {
      auto reply = std::move(scripted.front());
      scripted.pop_front();
      return reply;
    }
    if (refusal) {
      return plist::Dictionary{{SnareReplyKeys::kSuccess, false},
                               {SnareReplyKeys::kReasonCode, static_cast<std::int32_t>(*refusal)}};
    }
    const std::string identifier = "capture-" + std::to_string(++captures);
    return plist::Dictionary{{SnareReplyKeys::kSuccess, true}, {SnareReplyKeys::kSessionIdentifier, identifier}};
  }

  std::mutex mutex;
  bool accepts = true;
  std::optional<platform::SnareReason> refusal;
  std::deque<std::optional<plist::Dictionary>> scripted;
  std::size_t captures = 0;
  std::size_t reporters = 0;
  std::vector<Call> calls;
  ReplyFaults replies;
};

class FakeSnareService::Reporter final : public platform::SnareReporter {
 public:
  Reporter(std::shared_ptr<Ledger> ledger, std::size_t number) : ledger_(std::move(ledger)), number_(number) {}

  plist::Dictionary makeSignature(const platform::SnareSignature& signature) override {
    using Keys = platform::SnareSignatureKeys;
    plist::Dictionary made{{Keys::kDomain, signature.domain},
                           {Keys::kType, signature.type},
                           {Keys::kSubType, signature.subType},
                           {Keys::kSubTypeContext, signature.subTypeContext}};
    if (signature.detectedProcess) {
      made.merge({{Keys::kDetectedProcess, *signature.detectedProcess}});
    }
    if (signature.triggerThresholdValues) {
      made.merge({{Keys::kTriggerThresholdValues, *signature.triggerThresholdValues}});
    }
    return made;
  }

  bool requestSnapshot(const platform::SnareRequest& request, ReplyHandler reply) override {
    return take(Kind::RequestSnapshot, request, std::move(reply));
  }

  bool startSession(const platform::SnareRequest& request, ReplyHandler reply) override {
    return take(Kind::StartSession, request, std::move(reply));
  }

  void cancelSession(std::string_view sessionIdentifier) override {
    ledger_->happened("snare cancel", sessionIdentifier);
    const std::lock_guard lock(ledger_->mutex);
    ledger_->calls.push_back({Kind::CancelSession, number_, {}, std::string(sessionIdentifier), true});
  }

 private:
  bool take(Kind kind, const platform::SnareRequest& request, ReplyHandler reply) {
    ledger_->happened(kind == Kind::RequestSnapshot ? "snare snapshot" : "snare start");
    std::optional<plist::Dictionary> answer;
    {
      const std::lock_guard lock(ledger_->mutex);
      ledger_->calls.push_back({kind, number_, request, {}, ledger_->accepts});
      if (!ledger_->accepts) return false;
      answer = ledger_->nextReply();
    }
    ledger_->replies.deliver([reply = std::move(reply), answer = std::move(answer)]() mutable { reply(answer); });
    return true;
  }

  const std::shared_ptr<Ledger> ledger_;
  const std::size_t number_;
};

FakeSnareService::FakeSnareService() : ledger_(std::make_shared<Ledger>()) {}

// Here, not with the ledger: a reply that runs may hold the last reporter, and a thread can't wait for itself.
FakeSnareService::~FakeSnareService() {
  ledger_->replies.joinThreads();
}

std::shared_ptr<platform::SnareReporter> FakeSnareService::createReporter() {
  ledger_->happened("snare reporter");
  const std::lock_guard lock(ledger_->mutex);
  return std::make_shared<Reporter>(ledger_, ++ledger_->reporters);
}

void FakeSnareService::recordOrderIn(OrderRecord& record) {
  ledger_->recordOrderIn(record);
}

void FakeSnareService::setAccepts(bool accepts) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->accepts = accepts;
}

void FakeSnareService::refuseWith(std::optional<platform::SnareReason> reason) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->refusal = reason;
}

void FakeSnareService::replyNextWith(std::optional<plist::Dictionary> reply) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->scripted.push_back(std::move(reply));
}

ReplyFaults& FakeSnareService::replies() {
  return ledger_->replies;
}

std::vector<FakeSnareService::Call> FakeSnareService::calls() const {
  const std::lock_guard lock(ledger_->mutex);
  return ledger_->calls;
}

std::size_t FakeSnareService::reporters() const {
  const std::lock_guard lock(ledger_->mutex);
  return ledger_->reporters;
}

}  // namespace tarn::testing
