#include "recorder/RecorderSnareService.h"

#include <array>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <mutex>
#include <string>
#include <system_error>
#include <thread>
#include <utility>

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
    if (!identifier.empty()) identifier += '-';
    for (std::size_t i = 0; i < group; ++i) identifier += kDigits[randomSource.below(kDigits.size())];
  }
  return identifier;
}

}  // namespace

// What the service and its reporters share: where requests are taken, and the thread that answers them.
class RecorderSnareService::Desk {
 public:
  Desk(Recorder& recorder, const platform::Clock& clock, platform::RandomSource& randomSource,
       std::optional<platform::SnareReason> refuse)
      : recorder_(recorder), clock_(clock), randomSource_(randomSource), refuse_(refuse) {}

  // Takes a request; whether it did.
  bool take(std::string_view name, const platform::SnareRequest& request, ReplyHandler handler) {
    const std::lock_guard lock(mutex_);
    if (closed_ || waiting_.size() >= kMostWaitingReplies || !ensureThread()) return false;
    record(name, request.payload.value_or(plist::Dictionary()),
           {{"signature", request.signature}, {"duration", request.durationSeconds}});
    waiting_.push_back(std::move(handler));
    work_.notify_one();
    return true;
  }

  void cancel(std::string_view sessionIdentifier) {
    const std::lock_guard lock(mutex_);
    if (!closed_) record("cancelSession", {}, {{"session", sessionIdentifier}});
  }

  // Takes nothing more, and ends the thread.
  void close() {
    std::deque<ReplyHandler> dropped;  // behind the lock: a handler may have the last of something
    std::thread thread;
    {
      const std::lock_guard lock(mutex_);
      closed_ = true;
      dropped.swap(waiting_);
      thread.swap(thread_);
      work_.notify_one();
    }
    if (thread.joinable()) thread.join();
  }

 private:
  void record(std::string_view name, plist::Dictionary payload, plist::Dictionary detail) {
    recorder_.record(kBackend, name, std::move(payload), std::move(detail), clock_.epochSeconds());
  }

  bool ensureThread() {
    if (thread_.joinable()) return true;
    try {
      thread_ = std::thread([this] { answer(); });
    } catch (const std::system_error&) {
      return false;
    }
    return true;
  }

  void answer() {
    std::unique_lock lock(mutex_);
    while (true) {
      work_.wait(lock, [this] { return closed_ || !waiting_.empty(); });
      if (closed_) return;
      {
        ReplyHandler handler = std::move(waiting_.front());
        waiting_.pop_front();
        lock.unlock();
        handler(reply());
      }
      lock.lock();
    }
  }

  plist::Dictionary reply() {
    if (refuse_) {
      return {{SnareReplyKeys::kSuccess, false}, {SnareReplyKeys::kReasonCode, static_cast<std::int32_t>(*refuse_)}};
    }
    return {{SnareReplyKeys::kSuccess, true}, {SnareReplyKeys::kSessionIdentifier, freshIdentifier(randomSource_)}};
  }

  Recorder& recorder_;
  const platform::Clock& clock_;
  platform::RandomSource& randomSource_;
  const std::optional<platform::SnareReason> refuse_;

  std::mutex mutex_;
  std::condition_variable work_;
  // Guarded by mutex_.
  std::deque<ReplyHandler> waiting_;
  std::thread thread_;
  bool closed_ = false;
};

class RecorderSnareService::Reporter final : public platform::SnareReporter {
 public:
  explicit Reporter(std::shared_ptr<Desk> desk) : desk_(std::move(desk)) {}

  plist::Dictionary makeSignature(const platform::SnareSignature& signature) override {
    using Keys = platform::SnareSignatureKeys;
    plist::Dictionary made{{Keys::kDomain, signature.domain},
                           {Keys::kType, signature.type},
                           {Keys::kSubType, signature.subType},
                           {Keys::kSubTypeContext, signature.subTypeContext}};
    if (signature.detectedProcess) made.set(Keys::kDetectedProcess, *signature.detectedProcess);
    if (signature.triggerThresholdValues) made.set(Keys::kTriggerThresholdValues, *signature.triggerThresholdValues);
    return made;
  }

  bool requestSnapshot(const platform::SnareRequest& request, ReplyHandler reply) override {
    return desk_->take("requestSnapshot", request, std::move(reply));
  }

  bool startSession(const platform::SnareRequest& request, ReplyHandler reply) override {
    return desk_->take("startSession", request, std::move(reply));
  }

  void cancelSession(std::string_view sessionIdentifier) override { desk_->cancel(sessionIdentifier); }

 private:
  const std::shared_ptr<Desk> desk_;
};

RecorderSnareService::RecorderSnareService(Recorder& recorder, const platform::Clock& clock,
                                           platform::RandomSource& randomSource,
                                           std::optional<platform::SnareReason> refuse)
    : desk_(std::make_shared<Desk>(recorder, clock, randomSource, refuse)) {}

RecorderSnareService::~RecorderSnareService() {
  desk_->close();
}

std::shared_ptr<platform::SnareReporter> RecorderSnareService::createReporter() {
  return std::make_shared<Reporter>(desk_);
}

}  // namespace tarn::recorder
