// SPDX-License-Identifier: Apache-2.0
// OrderRecord: one list of what happened in several fakes of a platform, so that a test can hold the order across them:
// that a line is logged before the request that it announces, say.
//
// Nothing is recorded until start(). An entry is a verb of the fake and what it was done to: "log TEXT", "wait",
// "gyre", "post NAME", "store KEY", "draft", "metric", "power EVENT", "run COMMAND", "close COMMAND", "snare reporter",
// "snare snapshot", "snare start", "snare cancel IDENTIFIER", "flume channels", "flume subscribe", "flume samples",
// "flume delta". Log texts stand without their prefix.
//
// Threads: any; the observer is called on that of the entry.
#pragma once

#include <atomic>
#include <functional>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace tarn::testing {

class OrderRecord {
 public:
  // Looks at the state of things at the moment of an entry.
  using Observer = std::function<void(const std::string& entry)>;

  OrderRecord() = default;
  OrderRecord(const OrderRecord&) = delete;
  OrderRecord& operator=(const OrderRecord&) = delete;

  // Begins an empty record.
  void start(Observer observer = {}) {
    const std::lock_guard lock(mutex_);
    entries_.clear();
    observer_ = std::move(observer);
    started_ = true;
  }
  void add(std::string_view verb, std::string_view what) {
    if (!started_) return;
    std::string entry(verb);
    if (!what.empty()) {
      entry.append(1, ' ').append(what);
    }
    Observer observer;
    {
      const std::lock_guard lock(mutex_);
      entries_.push_back(entry);
      observer = observer_;
    }
    if (observer) {
      observer(entry);
    }
  }
  bool started() const noexcept { return started_; }
  std::vector<std::string> entries() const {
    const std::lock_guard lock(mutex_);
    return entries_;
  }

 private:
  std::atomic<bool> started_{false};
  mutable std::mutex mutex_;
  Observer observer_;                 // guarded by mutex_
  std::vector<std::string> entries_;  // guarded by mutex_
};

// What a fake that takes part is.
class Recorded {
 public:
  // Before the fake is used.
  void recordOrderIn(OrderRecord& record) { record_ = &record; }

 protected:
  Recorded() = default;
  ~Recorded() = default;
  bool isRecorded() const noexcept { return record_ != nullptr && record_->started(); }
  void happened(std::string_view verb, std::string_view what = {}) const {
    if (record_ != nullptr) {
      record_->add(verb, what);
    }
  }

 private:
  OrderRecord* record_ = nullptr;
};

}  // namespace tarn::testing
