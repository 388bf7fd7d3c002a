// SPDX-License-Identifier: Apache-2.0
#include "host/system/ThreadRank.h"

#include <sched.h>
#include <sys/resource.h>

namespace tarn::linux_host {

namespace {

// A third of the weight of who is ahead, and woken later.
constexpr int kBack = 5;

}  // namespace

void standBack() noexcept {
  const int policy = ::sched_getscheduler(0);
  if (policy == SCHED_RR || policy == SCHED_FIFO) {
    // Threads of one rank take turns of a tenth of a second there, in which the others don't run.
    sched_param rank{};
    if (::sched_getparam(0, &rank) == 0 && rank.sched_priority > ::sched_get_priority_min(policy)) {
      --rank.sched_priority;
      static_cast<void>(::sched_setparam(0, &rank));
    }
    return;
  }
  static_cast<void>(::setpriority(PRIO_PROCESS, 0, ::getpriority(PRIO_PROCESS, 0) + kBack));
}

}  // namespace tarn::linux_host
