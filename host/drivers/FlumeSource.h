// SPDX-License-Identifier: Apache-2.0
// FlumeSource: where driver report channels come from on this machine. LinuxFlumeService offers what its sources hold:
// the files that drivers write (FlumeFiles) and the kernel's own counts (AlsaFlume).
#pragma once

#include "platform/FlumeService.h"

namespace tarn::linux_host {

class FlumeSource {
 public:
  virtual ~FlumeSource() = default;
  // Every channel as it is now, no two known alike. What can't be read is left out, and the source logs why. Blocks on
  // small files; bounded by the source. Threads: the server queue.
  virtual platform::FlumeSamples read() = 0;
};

}  // namespace tarn::linux_host
