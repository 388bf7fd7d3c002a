// Deadline: calls somebody when a time is up, whatever all other threads are at.
//
// Threads: start() and cancel() one; what is called runs on a thread of its own.
#pragma once

#include <chrono>
#include <thread>

#include "platform/UniqueFunction.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class Deadline {
 public:
  Deadline() = default;
  Deadline(const Deadline&) = delete;
  Deadline& operator=(const Deadline&) = delete;
  ~Deadline() { cancel(); }

  // To be called once.
  void start(std::chrono::milliseconds after, platform::UniqueFunction<void()> isOver);
  // What wasn't called by now never is; what is being called is waited for.
  void cancel();

 private:
  Mutex mutex_;
  ConditionVariable changed_;
  bool cancelled_ TARN_GUARDED_BY(mutex_) = false;
  std::thread thread_;
};

}  // namespace tarn::linux_host
