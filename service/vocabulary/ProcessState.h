// SPDX-License-Identifier: Apache-2.0
// ProcessState: the one home of what belongs to the whole process: the installed facilities, the answers that are asked
// for once, and whatever a part of the system shares between sessions.
//
//   ProcessState::of<TarnReportingMemoryLogLimiter>()->claim(now);
//
// Owner: the installation of the facilities (TarnReportingInstallFacilities). A type's state is made on first use. When
// the facilities are taken away or replaced, all of it goes, last made first, while they can still be reached; so
// nothing of one installation reaches the next. Who holds a state may keep it longer.
//
// Outside this home nothing mutable lives as long as the process: tools/lint/statics.py sees to it.
//
// Threads: any; each type guards what it holds. Only one thread makes a state, and the others wait; so its constructor
// asks for no other one.
#pragma once

#include <memory>
#include <mutex>
#include <vector>

#include "plist/ThreadSafety.h"

namespace tarn {

namespace platform {
struct Facilities;
class WorkQueue;
}  // namespace platform

// There is one at a time, between the installation of facilities and the next one. Installing and taking away happen
// while no other thread uses the system, so the pointer to it needs no lock.
class ProcessState {
 public:
  // The facilities are the installer's and outlive this.
  explicit ProcessState(const platform::Facilities& installed) : facilities(installed) {}
  ProcessState(const ProcessState&) = delete;
  ProcessState& operator=(const ProcessState&) = delete;

  // What the installation owns; ends the process when there is none. A line on standard error tells why, since there is
  // no log then.
  static ProcessState& current() noexcept;
  // The process's one T. T has a constructor without arguments. A search through the handful of types that there are,
  // under the lock; who asks often keeps the pointer.
  template <class T>
  static std::shared_ptr<T> of() {
    return std::static_pointer_cast<T>(
        current().find(&kTag<T>, []() -> std::shared_ptr<void> { return std::make_shared<T>(); }));
  }

  // Drops everything below and the states. The installation calls it while it still stands. The server queue goes
  // first, as what it still holds may ask for states; the end of one state may make another, so this goes on until none
  // is left.
  void clear();

  const platform::Facilities& facilities;
  // TarnReportingUtility's, which are asked for with every request. The answer and the queue stand open here because a
  // request asks for each several times: through find() that would be a lock and a search.
  std::once_flag internalBuildOnce;
  bool internalBuild = false;
  std::once_flag serverQueueOnce;
  std::shared_ptr<platform::WorkQueue> serverQueue;

 private:
  // Its address tells the type. One a type, without run-time type information.
  template <class T>
  static constexpr char kTag = 0;

  // A type's tag and its state.
  struct Entry {
    const void* tag;
    std::shared_ptr<void> state;
  };

  // Makes the state under the lock when there is none. takeLast() gives the newest out of the list, null at its end: it
  // is destroyed by the caller, outside the lock.
  std::shared_ptr<void> find(const void* tag, std::shared_ptr<void> (*make)());
  std::shared_ptr<void> takeLast();

  Mutex mutex_;
  std::vector<Entry> entries_ TARN_GUARDED_BY(mutex_);  // in the order in which they were made
};

}  // namespace tarn
