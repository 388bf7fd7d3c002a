// SPDX-License-Identifier: Apache-2.0
// ProcessControl: the end of the process. Threads: any.
#pragma once

namespace tarn::platform {

// Owned by the platform, which alone knows what must be safe before the process ends.
class ProcessControl {
 public:
  virtual ~ProcessControl() = default;
  // Ends the process with this status, once what the back-ends still hold is safe. Sessions are not stopped. On a
  // device it doesn't return; a fake does, so callers return right after it.
  virtual void exitProcess(int status) = 0;
};

}  // namespace tarn::platform
