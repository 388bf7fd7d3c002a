// SPDX-License-Identifier: Apache-2.0
// TarnReportingSnareProcessState: what the Snare worker's fault detectors remember across sessions.
//
// Some faults show only over many short sessions, so their counts belong to the process. One shared instance, made by
// the first Snare worker. It holds as many states as there are detector classes that share one.
//
// Threads: any.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string_view>

#include "plist/ThreadSafety.h"

namespace tarn {

struct WorkerInstanceState;

// Owner: ProcessState, shared by the instances. It goes with the installed facilities, so counts don't outlive a run.
class TarnReportingSnareProcessState {
 public:
  // When a detector fired last, whatever the session. Its holder keeps the lock for a whole fire. Holding the lock for
  // a whole fire keeps two sessions from both finding that the last one is long ago.
  struct RateLimit {
    Mutex lock;
    std::optional<double> lastFire TARN_GUARDED_BY(lock);  // epoch seconds
  };

  // The shared instance.
  static std::shared_ptr<TarnReportingSnareProcessState> shared();

  TarnReportingSnareProcessState() = default;
  TarnReportingSnareProcessState(const TarnReportingSnareProcessState&) = delete;
  TarnReportingSnareProcessState& operator=(const TarnReportingSnareProcessState&) = delete;

  // The state of a detector class; made by `make` when there is none yet, else as it is. The name is static. Making it
  // is done under the lock, so it is made once.
  std::shared_ptr<WorkerInstanceState> stateFor(std::string_view className,
                                                std::shared_ptr<WorkerInstanceState> (*make)());
  // Of the detector of stuck system sounds.
  RateLimit& systemSoundRateLimit() noexcept { return systemSoundRateLimit_; }

 private:
  Mutex mutex_;
  // By the class's static name.
  std::map<std::string_view, std::shared_ptr<WorkerInstanceState>> states_ TARN_GUARDED_BY(mutex_);
  RateLimit systemSoundRateLimit_;
};

}  // namespace tarn
