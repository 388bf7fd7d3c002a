// SPDX-License-Identifier: Apache-2.0
#include "testing/ManualConditions.h"

#include <utility>

namespace tarn::testing {

namespace detail {

// What the conditions of one ManualConditions share.
struct WaitScript : Recorded {
  using Recorded::happened;

  std::mutex mutex;  // guards all below
  ManualConditions::WaitHook hook;
  std::vector<std::chrono::duration<double>> timeouts;
};

}  // namespace detail

bool ManualCondition::waitFor(std::chrono::duration<double> timeout) {
  script_->happened("wait");
  ManualConditions::WaitHook hook;
  {
    const std::lock_guard lock(script_->mutex);
    script_->timeouts.push_back(timeout);
    hook = script_->hook;
  }
  const std::size_t signalsBefore = signals_;
  WaitEnd end = WaitEnd::TimesOut;
  if (hook) {
    mutex_.unlock();
    end = hook(timeout);
    mutex_.lock();
  }
  return end == WaitEnd::Wakes || signals_ != signalsBefore;
}

void ManualCondition::signal() {
  ++signals_;
}

ManualConditions::ManualConditions() : script_(std::make_shared<detail::WaitScript>()) {}

ManualConditions::~ManualConditions() = default;

std::shared_ptr<platform::Condition> ManualConditions::makeCondition() {
  made_.push_back(std::make_shared<ManualCondition>(script_));
  return made_.back();
}

void ManualConditions::recordOrderIn(OrderRecord& record) {
  script_->recordOrderIn(record);
}

std::shared_ptr<void> ManualConditions::blockOnPurpose() {
  auto block = std::make_shared<std::size_t>(++blocks_);
  block_ = block;
  return block;
}

void ManualConditions::onWait(WaitHook hook) {
  const std::lock_guard lock(script_->mutex);
  script_->hook = std::move(hook);
}

std::vector<std::chrono::duration<double>> ManualConditions::timeouts() const {
  const std::lock_guard lock(script_->mutex);
  return script_->timeouts;
}

}  // namespace tarn::testing
