// FlumeSource: where driver report channels come from on this machine. LinuxFlumeService offers what its sources hold.
#pragma once

#include "platform/FlumeService.h"

namespace tarn::linux_host {

class FlumeSource {
 public:
  virtual ~FlumeSource() = default;
  // Every channel as it is now. What can't be read is left out, and the source logs why. Threads: the server queue.
  virtual platform::FlumeSamples read() = 0;
};

}  // namespace tarn::linux_host
