// eventually: polls a condition until it holds or a generous deadline has passed.
#pragma once

#include <chrono>
#include <thread>

namespace tarn::testing {

template <class Condition>
bool eventually(Condition condition, std::chrono::seconds patience = std::chrono::seconds(20)) {
  const auto deadline = std::chrono::steady_clock::now() + patience;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > deadline) {
      return false;
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  return true;
}

}  // namespace tarn::testing
