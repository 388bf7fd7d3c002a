// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderSnareService.h"

#include <array>
#include <atomic>
#include <cstdint>
#include <string>
#include <utility>

#include "recorder/LateReplies.h"
#include "recorder/Recorder.h"

namespace tarn::recorder {

namespace {

using platform::SnareReplyKeys;
using ReplyHandler = platform::SnareReporter::ReplyHandler;

constexpr std::string_view kBackend = "snare";

// 128 random bits in hexadecimal, in the usual groups.
std::string freshIdentifier(platform::RandomSource& randomSource) {
  constexpr std::string_view kDigits = "0123456789ABCDEF";
  constexpr std::array<std::size_t, 5> kGroups{8, 4, 4, 4, 12};
  std::string identifier;
  for (const std::size_t group : kGroups) {
    if (!identifier.empty()) {
      identifier += '-';
    }
    for (std::size_t i = 0; i < group; ++i) {
      identifier += kDigits[randomSource.below(kDigits.size())];
    }
  }
  return identifier;
}

}  // namespace

// What the service and its reporters share: where requests are taken and answered.
class RecorderSnareService::Intake {
 public:
  Intake(Recorder& recorder, const platform::Clock& clock, platform::RandomSource& randomSource,
         platform::WorkQueues& workQueues, std::optional<platform::SnareReason> refuse)
      : recorder_(recorder),
        clock_(clock),
        randomSource_(randomSource),
        refuse_(codeOf(refuse)),
        replies_(workQueues, {"sys.oxbow.tarnkit.recorder.snare", kMostWaitingReplies}) {}

  // Takes a request; whether it did. It is recorded before it is answered.
  bool take(std::string_view name, const platform::SnareRequest& request, ReplyHandler handler) {
    return replies_.add([this, handler = std::move(handler)]() mutable { handler(reply()); },
                        [&] {
                          record(name, request.payload.value_or(plist::Dictionary()),
                                 {{"signature", request.signature}, {"duration", request.durationSeconds}});
                        });
  }

  void cancel(std::string_view sessionIdentifier) {
    replies_.ifOpen([&] { record("cancelSession", {}, {{"session", sessionIdentifier}}); });
  }

  void setRefusal(std::optional<platform::SnareReason> refuse) noexcept { refuse_ = codeOf(refuse); }
  // Takes and answers nothing more.
  void close() { replies_.close(); }

 private:
  static constexpr std::int32_t kNoRefusal = -1;

  static std::int32_t codeOf(std::optional<platform::SnareReason> refuse) noexcept {
    return refuse ? static_cast<std::int32_t>(*refuse) : kNoRefusal;
  }

  void record(std::string_view name, plist::Dictionary payload, plist::Dictionary detail) {
    recorder_.record(kBackend, name, std::move(payload), std::move(detail), clock_.epochSeconds());
  }

  plist::Dictionary reply() {
    if (const std::int32_t refusal = refuse_; refusal != kNoRefusal) {
      return {{SnareReplyKeys::kSuccess, false}, {SnareReplyKeys::kReasonCode, refusal}};
    }
    return {{SnareReplyKeys::kSuccess, true}, {SnareReplyKeys::kSessionIdentifier, freshIdentifier(randomSource_)}};
  }

  Recorder& recorder_;
  const platform::Clock& clock_;
  platform::RandomSource& randomSource_;
  std::atomic<std::int32_t> refuse_;  // a reason, or that there is none
  LateReplies replies_;
};

class RecorderSnareService::Reporter final : public platform::SnareReporter {
 public:
  explicit Reporter(std::shared_ptr<Intake> intake) : intake_(std::move(intake)) {}

  plist::Dictionary makeSignature(const platform::SnareSignature& signature) override {
    using Keys = platform::SnareSignatureKeys;
    plist::Dictionary made{{Keys::kDomain, signature.domain},
                           {Keys::kType, signature.type},
                           {Keys::kSubType, signature.subType},
                           {Keys::kSubTypeContext, signature.subTypeContext}};
    if (signature.detectedProcess) {
      made.set(Keys::kDetectedProcess, *signature.detectedProcess);
    }
    if (signature.triggerThresholdValues) {
      made.set(Keys::kTriggerThresholdValues, *signature.triggerThresholdValues);
    }
    return made;
  }

  bool requestSnapshot(const platform::SnareRequest& request, ReplyHandler reply) override {
    return intake_->take("requestSnapshot", request, std::move(reply));
  }

  bool startSession(const platform::SnareRequest& request, ReplyHandler reply) override {
    return intake_->take("startSession", request, std::move(reply));
  }

  void cancelSession(std::string_view sessionIdentifier) override { intake_->cancel(sessionIdentifier); }

 private:
  const std::shared_ptr<Intake> intake_;
};

RecorderSnareService::RecorderSnareService(Recorder& recorder, const platform::Clock& clock,
                                           platform::RandomSource& randomSource, platform::WorkQueues& workQueues,
                                           std::optional<platform::SnareReason> refuse)
    : intake_(std::make_shared<Intake>(recorder, clock, randomSource, workQueues, refuse)) {}

RecorderSnareService::~RecorderSnareService() {
  intake_->close();
}

void RecorderSnareService::setRefusal(std::optional<platform::SnareReason> refuse) noexcept {
  intake_->setRefusal(refuse);
}

std::shared_ptr<platform::SnareReporter> RecorderSnareService::createReporter() {
  return std::make_shared<Reporter>(intake_);
}

}  // namespace tarn::recorder
