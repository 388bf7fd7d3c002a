// SPDX-License-Identifier: Apache-2.0
// LinuxRandomSource: the kernel's random numbers. Keeps no state. Threads: any.
#pragma once

#include "platform/RandomSource.h"

namespace tarn::linux_host {

class LinuxRandomSource final : public platform::RandomSource {
 public:
  // One system call, rarely two: words that would make some results likelier are drawn again. A kernel without random
  // numbers ends the process, as nobody may go on with foreseeable ones; at boot it may block until there are some.
  std::uint64_t below(std::uint64_t bound) override;
};

}  // namespace tarn::linux_host
