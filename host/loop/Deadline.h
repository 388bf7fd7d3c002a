// Deadline: calls somebody when a time is up, whatever all other threads are at. For the end of the process: the loop,
// the pool and the recorder may each be what hangs, so none of them can keep this time.
//
// Owned by the platform. Threads: start() and cancel() one; what is called runs on a thread of its own, which exists
// from start() on and sleeps until then.
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

  // Calls `isOver` once after that time unless it was cancelled. To be called once; throws when the system has no
  // thread to give. What is called must not cancel this deadline, as that would wait for itself.
  void start(std::chrono::milliseconds after, platform::UniqueFunction<void()> isOver);
  // What wasn't called by now never is; what is being called is waited for, however long it takes. Safe before start()
  // and a second time.
  void cancel();

 private:
  Mutex mutex_;
  // Ends the thread's sleep ahead of its time.
  ConditionVariable changed_;
  bool cancelled_ TARN_GUARDED_BY(mutex_) = false;
  std::thread thread_;
};

}  // namespace tarn::linux_host
