#include "diagnostics/snare/TarnReportingSnareProcessState.h"

#include "diagnostics/snare/WorkerInstanceState.h"

namespace tarn {

namespace {

// The shared instance and the lock on it.
struct Shared {
  std::mutex lock;
  std::shared_ptr<TarnReportingSnareProcessState> instance;
};

Shared& theShared() {
  static Shared theOne;
  return theOne;
}

}  // namespace

std::shared_ptr<TarnReportingSnareProcessState> TarnReportingSnareProcessState::shared() {
  const std::lock_guard guard(theShared().lock);
  if (theShared().instance == nullptr) {
    theShared().instance = std::make_shared<TarnReportingSnareProcessState>();
  }
  return theShared().instance;
}

void TarnReportingSnareProcessState::reset() {
  std::shared_ptr<TarnReportingSnareProcessState> instance;  // dies behind the lock
  const std::lock_guard guard(theShared().lock);
  instance.swap(theShared().instance);
}

std::shared_ptr<WorkerInstanceState> TarnReportingSnareProcessState::stateFor(
    std::string_view className, std::shared_ptr<WorkerInstanceState> (*make)()) {
  const std::lock_guard guard(mutex_);
  std::shared_ptr<WorkerInstanceState>& state = states_[className];
  if (state == nullptr) {
    state = make();
  }
  return state;
}

}  // namespace tarn
