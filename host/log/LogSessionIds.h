// SPDX-License-Identifier: Apache-2.0
// LogSessionIds: by which number log entries name a session: its id in the recorder's file, where a reader looks it up.
// Sessions are numbered from 1 in each run while it goes; their ids go on from those of the runs before.
//
// Owned by HostSetup, which knows the log; told by the platform, which knows the recorder. Threads: any.
#pragma once

#include <atomic>
#include <cstdint>

#include "platform/SessionRecords.h"

namespace tarn::linux_host {

class LogSessionIds {
 public:
  // The last id that the runs before gave; 0 where nobody keeps them, so that ids count from 1.
  void goOnFrom(std::int64_t last) noexcept { last_.store(last, std::memory_order_relaxed); }
  // 0 for no session, and as long as it isn't known where ids go on from: no number is better than a wrong one.
  std::int64_t of(platform::SessionNumber session) const noexcept {
    const std::int64_t last = last_.load(std::memory_order_relaxed);
    return session == 0 || last < 0 ? 0 : last + session;
  }

 private:
  std::atomic<std::int64_t> last_{-1};
};

}  // namespace tarn::linux_host
