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

class ProcessState {
 public:
  explicit ProcessState(const platform::Facilities& installed) : facilities(installed) {}
  ProcessState(const ProcessState&) = delete;
  ProcessState& operator=(const ProcessState&) = delete;

  // What the installation owns; ends the process when there is none.
  static ProcessState& current() noexcept;
  // The process's one T.
  template <class T>
  static std::shared_ptr<T> of() {
    return std::static_pointer_cast<T>(
        current().find(&kTag<T>, []() -> std::shared_ptr<void> { return std::make_shared<T>(); }));
  }

  // Drops everything below and the states. The installation calls it while it still stands.
  void clear();

  const platform::Facilities& facilities;
  // TarnReportingUtility's, which are asked for with every request.
  std::once_flag internalBuildOnce;
  bool internalBuild = false;
  std::once_flag serverQueueOnce;
  std::shared_ptr<platform::WorkQueue> serverQueue;

 private:
  // Its address tells the type.
  template <class T>
  static constexpr char kTag = 0;

  struct Entry {
    const void* tag;
    std::shared_ptr<void> state;
  };

  std::shared_ptr<void> find(const void* tag, std::shared_ptr<void> (*make)());
  std::shared_ptr<void> takeLast();

  Mutex mutex_;
  std::vector<Entry> entries_ TARN_GUARDED_BY(mutex_);  // in the order in which they were made
};

}  // namespace tarn
