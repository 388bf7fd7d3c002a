// SPDX-License-Identifier: Apache-2.0
// eventually: polls a condition until it holds or a generous deadline has passed.
#pragma once

#include <poll.h>

#include <chrono>

namespace tarn::testing {

template <class Condition>
bool eventually(Condition condition, std::chrono::seconds patience = std::chrono::seconds(20)) {
  const auto deadline = std::chrono::steady_clock::now() + patience;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    ::poll(nullptr, 0, 1);
  }
  return true;
}

}  // namespace tarn::testing
