// SPDX-License-Identifier: Apache-2.0
// ActionOutlet: where an adapter's actions go: to the service by a Reporter, or printed as a script. With --once they
// go nowhere.
//
// Owned by the program; the log outlives it. Threads: one at a time.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "adapters/pipewire/AdapterLog.h"
#include "adapters/pipewire/AdapterOptions.h"
#include "adapters/pipewire/Reporter.h"
#include "adapters/pipewire/core/StreamActions.h"

namespace tarn::streams {

class ActionOutlet {
 public:
  ActionOutlet(const AdapterOptions& options, const AdapterLog& log) : options_(options), log_(log) {}

  // Whether it can report, or needn't; the log tells why not.
  bool open();
  void carryOut(const Actions& actions);
  // Waits until the service has taken what was posted, for a while.
  void close();

 private:
  void tellLosses();

  const AdapterOptions& options_;
  const AdapterLog& log_;
  std::optional<Reporter> reporter_;  // none: what is said is printed
  std::uint64_t toldLosses_ = 0;
};

}  // namespace tarn::streams
