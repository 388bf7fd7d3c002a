// SPDX-License-Identifier: Apache-2.0
// FileLock: keeps other processes, and other threads of this one, from writing what they write under the same lock.
// Held until its end. Waiting is bounded, so that a process that hangs with the lock can't hang us.
//
// An advisory flock(2): it binds only those that take it too, belongs to the open file and not to the process, and is
// given back by the kernel when the process dies, so no lock is ever stale. Threads: one at a time. Nothing is thrown
// but for want of memory.
#pragma once

#include <chrono>
#include <string>

#include "host/system/UniqueDescriptor.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class FileLock {
 public:
  // Takes the lock of an open file and blocks for at most `patience` (0: one try). ETIMEDOUT when another holds it for
  // longer, else the error of flock(2). There is no bounded wait in the kernel, so the lock is tried again each
  // millisecond; waiters aren't served in their order. The lock ends when the descriptor, which stays the caller's, is
  // closed.
  static Status take(int descriptor, std::chrono::milliseconds patience);

  // The same on a file of its own, which is made with mode 0644 when it isn't there and stays, as removing it would let
  // two processes lock two files of one name. A symbolic link in its place is refused (ELOOP). After an error this
  // object holds nothing; a lock that it held before is given up only when the new one is taken.
  Status take(const std::string& path, std::chrono::milliseconds patience);

 private:
  // Of the second form alone: its closing at the end gives the lock back.
  UniqueDescriptor file_;
};

}  // namespace tarn::linux_host
