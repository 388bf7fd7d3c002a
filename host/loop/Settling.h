// SPDX-License-Identifier: Apache-2.0
// settleWhileShrinking: waits for queues at the end of the process, for as long as they get shorter.
//
// Why not one long wait: a queue that a back-end holds would cost all of it at each end, and a long but moving one
// could need more. So time is given as long as it is used. Threads: one that is none of the queues'.
#pragma once

#include <chrono>
#include <cstddef>
#include <utility>

namespace tarn::linux_host {

// Waits until nothing is unfinished, `longest` at a time, and no more once such a wait has finished nothing: a back-end
// keeps the rest waiting. How many pieces are left; 0 when all is done. New work that comes as fast as the old one goes
// ends it too. `Queues` has unfinished() and settle(), as LinuxWorkQueues has.
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
