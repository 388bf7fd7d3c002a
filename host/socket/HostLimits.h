// HostLimits: every bound that protects the service from its clients, and what happens when it is reached.
#pragma once

#include <chrono>
#include <cstddef>

#include "host/loop/WorkerPool.h"
#include "wire/Operation.h"

namespace tarn::linux_host {

struct HostLimits {
  // A longer frame closes its connection. A connection's input never takes more than this and a gulp.
  std::size_t maxFrameBytes = wire::kDefaultMaxFrameBytes;
  // Bytes that are received from one connection before the next has its turn.
  std::size_t gulpBytes = 65536;
  // Replies that a client left unread, beside what the system holds for it; with more it is cut off.
  std::size_t maxUnreadReplyBytes = std::size_t{4} << 20;
  // Pieces of work that wait on the server queue; with more, connections stop at their next request until fewer wait.
  std::size_t maxQueuedWork = 4096;
  // Open connections; with more, the others wait in the listener's backlog until one ends.
  std::size_t maxConnections = 4096;
  // Up to so many open connections keep their input buffers while they are quiet.
  std::size_t keptBuffers = 64;
  // Pieces of work of the workers' own queues; beyond the high mark connections stop likewise, until the low one.
  WorkerPool::Marks poolWork;
  // For how long the end waits for those queues without seeing them get shorter; then what is left stays undone.
  std::chrono::milliseconds settleTime{500};
  // For how long the end in order serves the clients' ends; then what is left of them is dropped.
  std::chrono::milliseconds endTime{10'000};

  bool operator==(const HostLimits&) const = default;
};

}  // namespace tarn::linux_host
