// SPDX-License-Identifier: Apache-2.0
// RandomSource: numbers that nobody can foresee. Threads: any.
#pragma once

#include <cstdint>

namespace tarn::platform {

// Owned by the platform. For identifiers and for moments that devices shouldn't share; a draw may cost a system call.
class RandomSource {
 public:
  virtual ~RandomSource() = default;
  // A whole number from 0 to `bound` - 1, each as likely as any other; 0 for a bound of 0. Never fails: a system
  // without random numbers ends the process.
  virtual std::uint64_t below(std::uint64_t bound) = 0;
};

}  // namespace tarn::platform
