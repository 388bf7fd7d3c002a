// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/snare/TarnReportingSnareProcessState.h"

#include "diagnostics/snare/WorkerInstanceState.h"
#include "service/vocabulary/ProcessState.h"

namespace tarn {

std::shared_ptr<TarnReportingSnareProcessState> TarnReportingSnareProcessState::shared() {
  return ProcessState::of<TarnReportingSnareProcessState>();
}

std::shared_ptr<WorkerInstanceState> TarnReportingSnareProcessState::stateFor(
    std::string_view className, std::shared_ptr<WorkerInstanceState> (*make)()) {
  const MutexLock guard(mutex_);
  std::shared_ptr<WorkerInstanceState>& state = states_[className];
  if (state == nullptr) {
    state = make();
  }
  return state;
}

}  // namespace tarn
