// settleWhileShrinking: waits for queues at the end of the process, for as long as they get shorter.
#pragma once

#include <chrono>
#include <cstddef>
#include <utility>

namespace tarn::linux_host {

// Waits until nothing is unfinished, each time for so long, and no more once such a wait has finished nothing: a
// back-end keeps the rest waiting. How much is left.
template <class Queues>
[[nodiscard]] std::size_t settleWhileShrinking(Queues& queues, std::chrono::nanoseconds longest) {
  std::size_t left = queues.unfinished();
  while (!queues.settle(longest)) {
    const std::size_t before = std::exchange(left, queues.unfinished());
    if (left >= before) return left;
  }
  return 0;
}

}  // namespace tarn::linux_host
