// SPDX-License-Identifier: Apache-2.0
// OwnMemory: marks what a fake does for itself. What it keeps of a call isn't the memory of the code under test: while
// one of these lives, no test lets an allocation of this thread fail. Real facilities need none there, and calls that
// throw nothing have no other way.
//
// Threads: one.
#pragma once

namespace tarn::testing {

class OwnMemory {
 public:
  OwnMemory() noexcept { ++depth_; }
  OwnMemory(const OwnMemory&) = delete;
  OwnMemory& operator=(const OwnMemory&) = delete;
  ~OwnMemory() { --depth_; }

  static bool isUsed() noexcept { return depth_ != 0; }

 private:
  static inline thread_local int depth_ = 0;
};

}  // namespace tarn::testing
