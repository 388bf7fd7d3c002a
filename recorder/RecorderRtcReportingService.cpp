#include "recorder/RecorderRtcReportingService.h"

#include <condition_variable>
#include <deque>
#include <mutex>
#include <thread>
#include <utility>

#include "plist/Dictionary.h"
#include "recorder/Recorder.h"

namespace tarn::recorder {

namespace {

using SteadyClock = std::chrono::steady_clock;
using plist::Dictionary;

constexpr std::string_view kBackend = "rtc";

const plist::Key kSession("session");
const plist::Key kCategory("category");
const plist::Key kType("type");

}  // namespace

// The completions of starts. All are equally late, so they come in the order of the starts; without a delay they come
// within the call.
class RecorderRtcReportingService::Completions {
 public:
  using Completion = platform::RtcReportingSession::StartCompletion;

  Completions(std::optional<std::vector<std::string>> backends, std::chrono::milliseconds delay)
      : backends_(std::move(backends)), delay_(delay) {}
  Completions(const Completions&) = delete;
  Completions& operator=(const Completions&) = delete;
  ~Completions() { stop(); }

  void add(Completion completion) {
    if (delay_ == std::chrono::milliseconds::zero()) {
      completion(backends_);
      return;
    }
    const std::lock_guard lock(mutex_);
    if (stopping_) return;
    if (!thread_.joinable()) thread_ = std::thread([this] { run(); });
    pending_.push_back({SteadyClock::now() + delay_, std::move(completion)});
    if (pending_.size() == 1) changed_.notify_one();
  }
  void stop() {
    std::deque<Pending> left;  // destroyed behind the lock: each may hold the last of something
    {
      const std::lock_guard lock(mutex_);
      stopping_ = true;
      left.swap(pending_);
    }
    changed_.notify_one();
    if (thread_.joinable()) thread_.join();
  }

 private:
  struct Pending {
    SteadyClock::time_point due;
    Completion completion;
  };

  void run() {
    std::unique_lock lock(mutex_);
    while (!stopping_) {
      if (pending_.empty()) {
        changed_.wait(lock);
      } else if (const auto due = pending_.front().due; SteadyClock::now() < due) {
        changed_.wait_until(lock, due);
      } else {
        Completion completion = std::move(pending_.front().completion);
        pending_.pop_front();
        lock.unlock();
        completion(backends_);
        completion.reset();
        lock.lock();
      }
    }
  }

  const std::optional<std::vector<std::string>> backends_;
  const std::chrono::milliseconds delay_;
  std::mutex mutex_;
  std::condition_variable changed_;
  // Guarded by mutex_.
  std::deque<Pending> pending_;
  std::thread thread_;
  bool stopping_ = false;
};

class RecorderRtcReportingService::Session final : public platform::RtcReportingSession {
 public:
  Session(Recorder& recorder, const platform::Clock& clock, std::weak_ptr<Completions> completions, std::int64_t number)
      : recorder_(recorder), clock_(clock), completions_(std::move(completions)), number_(number) {}

  void startConfiguration(StartCompletion completion) override {
    if (const auto completions = completions_.lock()) completions->add(std::move(completion));
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
                                                         Behaviour behaviour)
    : recorder_(recorder),
      clock_(clock),
      available_(behaviour.available),
      completions_(std::make_shared<Completions>(std::move(behaviour.backends), behaviour.startDelay)) {}

RecorderRtcReportingService::~RecorderRtcReportingService() {
  completions_->stop();
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
