// SPDX-License-Identifier: Apache-2.0
// ManualConditions: conditions that never sleep. What happens while somebody waits is told by the test.
//
// Without a hook every wait times out at once. With one, each wait unlocks the condition, calls the hook and locks it
// again; the hook plays the back-end, and may signal, run queues, move the clock or join a thread.
//
// Threads: any; the hook is set before the waits begin.
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

#include "platform/Condition.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

enum class WaitEnd {
  TimesOut,  // unless the condition was signalled during the wait
  Wakes,     // with or without a signal
};

namespace detail {
struct WaitScript;
}

class ManualCondition final : public platform::Condition {
 public:
  explicit ManualCondition(std::shared_ptr<detail::WaitScript> script) : script_(std::move(script)) {}

  // The interface.
  void lock() override { mutex_.lock(); }
  void unlock() override { mutex_.unlock(); }
  bool waitFor(std::chrono::duration<double> timeout) override;
  void signal() override;  // the condition is locked

  // Observations; to be asked while nobody else uses the condition.
  std::size_t signals() const noexcept { return signals_; }

 private:
  const std::shared_ptr<detail::WaitScript> script_;
  std::mutex mutex_;
  std::size_t signals_ = 0;
};

class ManualConditions final : public platform::Conditions {
 public:
  using WaitHook = std::function<WaitEnd(std::chrono::duration<double> timeout)>;

  ManualConditions();
  ~ManualConditions() override;
  ManualConditions(const ManualConditions&) = delete;
  ManualConditions& operator=(const ManualConditions&) = delete;

  // The interface.
  std::shared_ptr<platform::Condition> makeCondition() override;
  std::shared_ptr<void> blockOnPurpose() override;

  // Controls.
  void recordOrderIn(OrderRecord& record);
  // Called in every wait of every condition from here; an empty one makes waits time out at once again.
  void onWait(WaitHook hook);

  // Observations.
  // The time-outs asked for, in the order of the waits.
  std::vector<std::chrono::duration<double>> timeouts() const;
  // Whether somebody blocks the queue on purpose, and how often somebody did.
  bool isBlockedOnPurpose() const noexcept { return !block_.expired(); }
  std::size_t blocks() const noexcept { return blocks_; }
  // The conditions that were made, in order.
  const std::vector<std::shared_ptr<ManualCondition>>& made() const noexcept { return made_; }

 private:
  const std::shared_ptr<detail::WaitScript> script_;
  std::vector<std::shared_ptr<ManualCondition>> made_;
  std::weak_ptr<void> block_;
  std::size_t blocks_ = 0;
};

}  // namespace tarn::testing
