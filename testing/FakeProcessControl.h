// SPDX-License-Identifier: Apache-2.0
// FakeProcessControl: keeps the exit statuses asked for; the process goes on. Threads: one at a time.
#pragma once

#include <functional>
#include <utility>
#include <vector>

#include "platform/ProcessControl.h"

namespace tarn::testing {

class FakeProcessControl final : public platform::ProcessControl {
 public:
  // The interface.
  void exitProcess(int status) override {
    exitStatuses_.push_back(status);
    if (onExit_) {
      onExit_();
    }
  }

  // Controls.
  // Called where the process would end.
  void onExit(std::function<void()> call) { onExit_ = std::move(call); }

  // Observations.
  const std::vector<int>& exitStatuses() const noexcept { return exitStatuses_; }

 private:
  std::vector<int> exitStatuses_;
  std::function<void()> onExit_;
};

}  // namespace tarn::testing
