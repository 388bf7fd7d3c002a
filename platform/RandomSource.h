// RandomSource: numbers that nobody can foresee. Threads: any.
#pragma once

#include <cstdint>

namespace tarn::platform {

class RandomSource {
 public:
  virtual ~RandomSource() = default;
  // A whole number from 0 to `bound` - 1, each as likely as any other; 0 for a bound of 0.
  virtual std::uint64_t below(std::uint64_t bound) = 0;
};

}  // namespace tarn::platform
