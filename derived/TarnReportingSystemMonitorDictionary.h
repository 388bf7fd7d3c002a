// SPDX-License-Identifier: Apache-2.0
// TarnReportingSystemMonitorDictionary: the last state of each device setting that the system monitor watches, and who
// wants to know when one changes.
//
// Owned by the system monitor; workers that observe it share it, so it may outlive the monitor. It is its own lock: all
// access holds it, taken by the operations themselves, and a caller whose steps belong together takes it around them
// (it may be taken again by who has it).
//
// Observers are called without the lock, on the thread that stored the state (the server queue), in the order in which
// they were added. So an observer may send messages, ask this dictionary, and add or remove observers, itself included.
// An observer that is removed on the server queue is not called any more; one that is removed on another thread may be
// in a call at that moment. States are replaced, never removed. Threads: any.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "platform/UniqueFunction.h"
#include "plist/Dictionary.h"
#include "plist/ThreadSafety.h"

namespace tarn {

class TARN_CAPABILITY TarnReportingSystemMonitorDictionary {
 public:
  using Observer = platform::UniqueFunction<void(const plist::Key& feature)>;
  enum class ObserverToken : std::uint64_t {};

  TarnReportingSystemMonitorDictionary() = default;
  TarnReportingSystemMonitorDictionary(const TarnReportingSystemMonitorDictionary&) = delete;
  TarnReportingSystemMonitorDictionary& operator=(const TarnReportingSystemMonitorDictionary&) = delete;

  // For a MutexLock around steps that belong together. Nobody waits or sends messages under it.
  void lock() const TARN_ACQUIRE();
  void unlock() const TARN_RELEASE();

  // The last state of a feature: its value under its own name, "tarnreporting_timestamp" and "systemuptime_sec". Empty
  // when it isn't known.
  plist::Dictionary state(const plist::Key& feature) const;
  // All of it: feature name to state.
  plist::Dictionary states() const;

  // Calls `observer` whenever a new state of the feature was stored; the state is then what state() gives. The observer
  // holds whoever it serves weakly, and goes with removeObserver. It isn't called for the state that is there already.
  // Tokens are never used again.
  [[nodiscard]] ObserverToken addObserver(const plist::Key& feature, Observer observer);
  // An unknown token is ignored. What the observer holds is released without the lock.
  void removeObserver(ObserverToken token);

  // For the monitor: stores a state without telling anybody, and tells the observers once the lock is released. While
  // they are told, one that another adds isn't called yet, and one that is removed isn't called any more.
  void store(const plist::Key& feature, const plist::Dictionary& state);
  void notifyObservers(const plist::Key& feature);

 private:
  // Shared with a round of notifications that goes on, which looks at `removed` before each call.
  struct Observation {
    ObserverToken token;
    plist::Key feature;
    Observer observer;
    bool removed = false;
  };

  mutable RecursiveMutex mutex_;  // guards `removed` of each observation too
  plist::Dictionary states_ TARN_GUARDED_BY(mutex_);
  std::vector<std::shared_ptr<Observation>> observations_ TARN_GUARDED_BY(mutex_);
  std::uint64_t lastToken_ TARN_GUARDED_BY(mutex_) = 0;
};

}  // namespace tarn
