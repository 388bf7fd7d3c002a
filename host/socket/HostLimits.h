// SPDX-License-Identifier: Apache-2.0
// HostLimits: every bound that protects the service from its clients, and what happens when it is reached. Plain data:
// the configuration sets some of it, tests any.
#pragma once

#include <chrono>
#include <cstddef>

#include "host/loop/WorkerPool.h"
#include "platform/OverflowStore.h"
#include "wire/Operation.h"

namespace tarn::linux_host {

struct HostLimits {
  // A longer frame closes its connection. A connection's input never takes more than this and a gulp.
  std::size_t maxFrameBytes = wire::kDefaultMaxFrameBytes;
  // Bytes that are received from one connection before the next has its turn: so many that a system call is little
  // beside what it brings, so few that decoding them is a matter of a turn.
  std::size_t gulpBytes = 65536;
  // Replies that a client left unread, beside what the system holds for it; with more it is cut off. It bounds what a
  // client takes that only asks and never reads.
  std::size_t maxUnreadReplyBytes = std::size_t{4} << 20;
  // Pieces of work that wait on the server queue; with more, connections stop at their next request until fewer wait.
  // They come from timers and back-ends: a connection's own work waits in its lane.
  std::size_t maxQueuedWork = 4096;
  // Open connections; with more, the others wait in the listener's backlog until one ends.
  std::size_t maxConnections = 4096;
  // What one connection and one user (a uid) may have. Who has it all is answered with an error that says so, and its
  // connection goes on; the defaults are far beyond what honest clients need.
  struct Quotas {
    std::size_t connectionsPerUser = 2048;  // half of all, so that one user's leave room for the others'
    std::size_t sessionsPerConnection = 65536;
    std::size_t sessionsPerUser = 131072;
    // Bytes of requests that were taken in and can't be served yet: half-sent frames, and what is held up.
    std::size_t waitingBytesPerUser = std::size_t{32} << 20;
    std::size_t waitingBytes = std::size_t{64} << 20;  // of all users
    // Memory that the messages of their sessions take. It is beyond what logs may take before the oldest go to disk, so
    // a message is refused only when there is no room there either; or else the service would be ended with all of it.
    std::size_t logBytesPerConnection = std::size_t{384} << 20;
    std::size_t logBytesPerUser = std::size_t{512} << 20;
    // 0: not bounded.
    std::size_t messagesPerSecondPerConnection = 0;
    std::size_t messagesPerSecondPerUser = 0;

    bool operator==(const Quotas&) const = default;
  };
  Quotas quotas;
  // Memory that the messages of one session, of all, and of all of a user take before the oldest are moved to a file.
  // The last keeps the service small whatever one user does, with one session or with thousands; the heap that so many
  // small blocks lie in may be twice as large. A session's own bound counts where a user may have more.
  platform::OverflowStore::Bounds logs{std::size_t{64} << 20, std::size_t{256} << 20, std::size_t{32} << 20};
  // How long a frame that was begun may wait for the rest; then its connection is cut off.
  std::chrono::milliseconds halfFrameTime{30000};
  // Up to so many open connections keep their input buffers while they are quiet, which spares busy ones the making of
  // a new one; with more, memory counts for more than that.
  std::size_t keptBuffers = 64;
  // Pieces of work of the workers' own queues; beyond the high mark connections stop likewise, until the low one.
  WorkerPool::Marks poolWork;
  // For how long the end waits for those queues without seeing them get shorter; then what is left stays undone.
  std::chrono::milliseconds settleTime{500};
  // For how long the end in order serves the clients' ends; then what is left of them is dropped, and the process ends
  // all the same. The service manager is told of it.
  std::chrono::milliseconds endTime{10'000};

  bool operator==(const HostLimits&) const = default;
};

}  // namespace tarn::linux_host
