// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakePerformanceTraceService.h"

#include <mutex>
#include <utility>

namespace tarn::testing {

using platform::PerformanceTraceDelegate;

struct FakePerformanceTraceService::Ledger {
  std::mutex mutex;
  bool makesSessions = true;
  Status startError;
  Status stopError;
  Status completionError;
  std::uint64_t eventsLeftOut = 0;
  std::vector<Trace> traces;
  ReplyFaults callbacks;
};

class FakePerformanceTraceService::Session final : public platform::PerformanceTraceSession,
                                                   public std::enable_shared_from_this<Session> {
 public:
  Session(std::shared_ptr<Ledger> ledger, std::size_t index) : ledger_(std::move(ledger)), index_(index) {}
  ~Session() override {
    const std::lock_guard lock(ledger_->mutex);
    ledger_->traces[index_].released = true;
  }
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;

  void setDelegate(std::weak_ptr<PerformanceTraceDelegate> delegate) override {
    const std::lock_guard lock(ledger_->mutex);
    delegate_ = std::move(delegate);
    ledger_->traces[index_].hasDelegate = !delegate_.expired();
  }

  void startTrace() override {
    Status error;
    {
      const std::lock_guard lock(ledger_->mutex);
      ++ledger_->traces[index_].starts;
      error = ledger_->startError;
      valid_ = error.ok();
    }
    // A session that was let go of makes no more callbacks.
    ledger_->callbacks.deliver([weak = weak_from_this(), error] {
      if (const auto self = weak.lock()) {
        self->tell([&](auto& delegate) { delegate.performanceTraceDidStart(error); });
      }
    });
  }

  void stopTrace() override {
    Status stopError;
    Status completionError;
    {
      const std::lock_guard lock(ledger_->mutex);
      ++ledger_->traces[index_].stops;
      stopError = ledger_->stopError;
      completionError = ledger_->completionError;
      valid_ = false;
    }
    ledger_->callbacks.deliver([weak = weak_from_this(), stopError, completionError] {
      if (const auto self = weak.lock()) {
        self->tellStopped(stopError, completionError);
      }
    });
  }

  bool isValid() const override {
    const std::lock_guard lock(ledger_->mutex);
    return valid_;
  }

  std::uint64_t eventsLeftOut() const override {
    const std::lock_guard lock(ledger_->mutex);
    return ledger_->eventsLeftOut;
  }

 private:
  template <class Call>
  void tell(Call call) {
    std::shared_ptr<PerformanceTraceDelegate> delegate;
    {
      const std::lock_guard lock(ledger_->mutex);
      delegate = delegate_.lock();
    }
    if (delegate != nullptr) {
      call(*delegate);
    }
  }

  void tellStopped(const Status& stopError, const Status& completionError) {
    tell([&](auto& delegate) { delegate.performanceTraceDidStop(stopError); });
    if (stopError.failed()) return;
    const auto number = std::to_string(index_ + 1);
    const auto location = completionError.failed() ? std::string() : "/device/traces/" + number;
    tell([&](auto& delegate) { delegate.performanceTraceDidComplete(location, "trace-" + number, completionError); });
  }

  const std::shared_ptr<Ledger> ledger_;
  const std::size_t index_;
  std::weak_ptr<PerformanceTraceDelegate> delegate_;
  bool valid_ = false;
};

FakePerformanceTraceService::FakePerformanceTraceService() : ledger_(std::make_shared<Ledger>()) {}

// Here, not with the ledger: a callback that runs may hold the last session, and a thread can't wait for itself.
FakePerformanceTraceService::~FakePerformanceTraceService() {
  ledger_->callbacks.joinThreads();
}

std::shared_ptr<platform::PerformanceTraceSession> FakePerformanceTraceService::createSession(
    const platform::PerformanceTraceConfiguration& configuration) {
  const std::lock_guard lock(ledger_->mutex);
  if (!ledger_->makesSessions) return nullptr;
  ledger_->traces.push_back({configuration, 0, 0, false, false});
  return std::make_shared<Session>(ledger_, ledger_->traces.size() - 1);
}

void FakePerformanceTraceService::setMakesSessions(bool makes) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->makesSessions = makes;
}

void FakePerformanceTraceService::failStart(Status error) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->startError = std::move(error);
}

void FakePerformanceTraceService::failStop(Status error) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->stopError = std::move(error);
}

void FakePerformanceTraceService::failCompletion(Status error) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->completionError = std::move(error);
}

void FakePerformanceTraceService::setEventsLeftOut(std::uint64_t count) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->eventsLeftOut = count;
}

ReplyFaults& FakePerformanceTraceService::callbacks() {
  return ledger_->callbacks;
}

std::vector<FakePerformanceTraceService::Trace> FakePerformanceTraceService::traces() const {
  const std::lock_guard lock(ledger_->mutex);
  return ledger_->traces;
}

}  // namespace tarn::testing
