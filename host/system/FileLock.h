// FileLock: keeps other processes, and other threads of this one, from writing what they write under the same lock.
// Held until its end. Waiting is bounded, so that a process that hangs with the lock can't hang us. Threads: one at a
// time.
#pragma once

#include <chrono>
#include <string>

#include "host/system/UniqueDescriptor.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class FileLock {
 public:
  // Takes the lock of an open file; ETIMEDOUT when another holds it for longer than `patience`. The lock ends with the
  // descriptor.
  static Status take(int descriptor, std::chrono::milliseconds patience);

  // The same on a file of its own, which is made when it isn't there and stays.
  Status take(const std::string& path, std::chrono::milliseconds patience);

 private:
  UniqueDescriptor file_;
};

}  // namespace tarn::linux_host
