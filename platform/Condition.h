// SPDX-License-Identifier: Apache-2.0
// Condition: a lockable condition variable for the rare place where the server queue must wait for a back-end.
//
// Such a wait is deliberate: the platform doesn't take it for a hang (up to 180 seconds, the longest that a worker may
// block the queue).
#pragma once

#include <chrono>
#include <memory>

#include "plist/ThreadSafety.h"

namespace tarn::platform {

// Shared by the one who waits and by those who signal, which may come when the waiter is gone. Nothing in it fails.
class TARN_CAPABILITY Condition {
 public:
  virtual ~Condition() = default;
  // The lock that what is waited for is read and changed under; not to be taken twice.
  virtual void lock() TARN_ACQUIRE() = 0;
  // Waking isn't bound to the lock: signal() may be called with it or without.
  virtual void unlock() TARN_RELEASE() = 0;
  // Waits, locked before and after, until it is signalled or `timeout` has passed; false means the time is up. May wake
  // without a signal, so whoever waits looks again what it waits for. A timeout of 0 or less doesn't wait. On the
  // server queue the platform goes on with its sockets meanwhile, but runs no other work of the queue.
  virtual bool waitFor(std::chrono::duration<double> timeout) = 0;
  // Wakes one waiter. Without one nothing happens, and nothing is remembered.
  virtual void signal() = 0;
};

// One a process.
class Conditions {
 public:
  virtual ~Conditions() = default;
  // A new condition, unlocked; never null.
  virtual std::shared_ptr<Condition> makeCondition() = 0;
  // Work that blocks the server queue on purpose, like a wait: until the returned handle is destroyed, on the same
  // thread. Nothing waits within it.
  [[nodiscard]] virtual std::shared_ptr<void> blockOnPurpose() = 0;
};

}  // namespace tarn::platform
