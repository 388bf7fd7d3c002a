// SPDX-License-Identifier: Apache-2.0
// Deadline: calls somebody when a time is up, whatever all other threads are at.
//
// Its thread is made beforehand, so that the time can be set when the system has no more of anything to give.
//
// Threads: prepare(), start() and cancel() one; what is called runs on a thread of its own.
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

  // Makes the thread, once.
  void prepare(platform::UniqueFunction<void()> isOver);
  // Calls it after that time. Once.
  void start(std::chrono::milliseconds after);
  // What wasn't called by now never is; what is being called is waited for.
  void cancel();

 private:
  void run();

  platform::UniqueFunction<void()> isOver_;
  Mutex mutex_;
  ConditionVariable changed_;
  std::chrono::milliseconds after_ TARN_GUARDED_BY(mutex_){};
  bool started_ TARN_GUARDED_BY(mutex_) = false;
  bool cancelled_ TARN_GUARDED_BY(mutex_) = false;
  std::thread thread_;
};

}  // namespace tarn::linux_host
