// SPDX-License-Identifier: Apache-2.0
// FakeListener: a listener at which the test connects clients. Threads: one at a time.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "platform/Listener.h"
#include "testing/FakeConnection.h"

namespace tarn::testing {

class FakeListener final : public platform::Listener {
 public:
  FakeListener() = default;
  FakeListener(const FakeListener&) = delete;
  FakeListener& operator=(const FakeListener&) = delete;

  // The interface.
  void setDelegate(std::weak_ptr<platform::ListenerDelegate> delegate) override;
  void resume() override { resumed_ = true; }

  // Controls.
  // Connects a client with this process ID, of the user 1000; the connections are numbered from 1. Null when the
  // listener isn't resumed, has no delegate or was told no.
  std::shared_ptr<FakeConnection> connect(std::int32_t processIdentifier);

  // Observations.
  bool resumed() const noexcept { return resumed_; }
  // The connections that were taken, in order.
  const std::vector<std::shared_ptr<FakeConnection>>& connections() const noexcept { return connections_; }

 private:
  std::weak_ptr<platform::ListenerDelegate> delegate_;
  bool resumed_ = false;
  std::int64_t lastNumber_ = 0;
  std::vector<std::shared_ptr<FakeConnection>> connections_;
};

}  // namespace tarn::testing
