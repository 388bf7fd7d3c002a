// LinuxRandomSource: the kernel's random numbers. Threads: any.
#pragma once

#include "platform/RandomSource.h"

namespace tarn::linux_host {

class LinuxRandomSource final : public platform::RandomSource {
 public:
  std::uint64_t below(std::uint64_t bound) override;
};

}  // namespace tarn::linux_host
