// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderRtcReportingService.h"

#include <utility>

#include "plist/Dictionary.h"
#include "plist/ThreadSafety.h"
#include "recorder/LateReplies.h"
#include "recorder/Recorder.h"

namespace tarn::recorder {

namespace {

using plist::Dictionary;

constexpr std::string_view kBackend = "rtc";
// Completions that may be late at once; more come without their delay.
constexpr std::size_t kMostLate = 65'536;

const plist::Key kSession("session");
const plist::Key kCategory("category");
const plist::Key kType("type");

}  // namespace

// The completions of starts: within the call, or late.
class RecorderRtcReportingService::Completions {
 public:
  Completions(platform::WorkQueues& workQueues, const Behaviour& behaviour)
      : isLate_(behaviour.startDelay != std::chrono::milliseconds::zero()),
        late_(workQueues, {"sys.oxbow.tarnkit.recorder.rtc", kMostLate, behaviour.startDelay}) {
    setBackends(behaviour);
  }

  void setBackends(const Behaviour& behaviour) {
    auto backends = std::make_shared<const Backends>(behaviour.noBackends ? Backends() : Backends(behaviour.backends));
    const MutexLock lock(mutex_);
    backends_.swap(backends);
  }

  void add(platform::RtcReportingSession::StartCompletion completion) {
    platform::Work complete(
        [backends = backends(), completion = std::move(completion)]() mutable { completion(*backends); });
    if (!isLate_ || !late_.add(std::move(complete))) {
      complete();
    }
  }
  void close() { late_.close(); }

 private:
  using Backends = std::optional<std::vector<std::string>>;

  std::shared_ptr<const Backends> backends() {
    const MutexLock lock(mutex_);
    return backends_;
  }

  Mutex mutex_;
  std::shared_ptr<const Backends> backends_ TARN_GUARDED_BY(mutex_);
  const bool isLate_;
  LateReplies late_;
};

class RecorderRtcReportingService::Session final : public platform::RtcReportingSession {
 public:
  Session(Recorder& recorder, const platform::Clock& clock, std::weak_ptr<Completions> completions, std::int64_t number)
      : recorder_(recorder), clock_(clock), completions_(std::move(completions)), number_(number) {}

  void startConfiguration(StartCompletion completion) override {
    if (const auto completions = completions_.lock()) {
      completions->add(std::move(completion));
    }
  }
  SendResult sendMessage(std::uint16_t category, std::uint16_t type, const Dictionary& payload) override {
    const Dictionary::Entry detail[] = {{kSession, number_}, {kCategory, unsigned{category}}, {kType, unsigned{type}}};
    recorder_.record(kBackend, "sendMessage", payload, Dictionary::fromEntries(detail), clock_.epochSeconds());
    return {true, {}};
  }
  void flushMessages() override {
    recorder_.record(kBackend, "flush", {}, {{"session", number_}}, clock_.epochSeconds());
  }
  std::string description() const override { return "rtc session " + std::to_string(number_); }

 private:
  Recorder& recorder_;
  const platform::Clock& clock_;
  const std::weak_ptr<Completions> completions_;
  const std::int64_t number_;
};

RecorderRtcReportingService::RecorderRtcReportingService(Recorder& recorder, const platform::Clock& clock,
                                                         platform::WorkQueues& workQueues, const Behaviour& behaviour)
    : recorder_(recorder),
      clock_(clock),
      available_(behaviour.available),
      completions_(std::make_shared<Completions>(workQueues, behaviour)) {}

RecorderRtcReportingService::~RecorderRtcReportingService() {
  completions_->close();
}

void RecorderRtcReportingService::setBehaviour(const Behaviour& behaviour) {
  available_ = behaviour.available;
  completions_->setBackends(behaviour);
}

std::optional<std::string> RecorderRtcReportingService::newHierarchyToken(const std::optional<std::string>&) {
  if (!available_) return std::nullopt;
  return "rtc-token-" + std::to_string(++tokens_);
}

std::shared_ptr<platform::RtcReportingSession> RecorderRtcReportingService::createSession(
    const Dictionary& sessionInfo, const Dictionary& userInfo, const std::optional<std::vector<std::string>>&) {
  const std::int64_t number = ++sessions_;
  recorder_.record(kBackend, "createSession", {{"sessionInfo", sessionInfo}, {"userInfo", userInfo}},
                   {{"session", number}}, clock_.epochSeconds());
  return std::make_shared<Session>(recorder_, clock_, completions_, number);
}

}  // namespace tarn::recorder
