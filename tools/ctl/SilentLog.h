// SPDX-License-Identifier: Apache-2.0
// SilentLog: for facilities that also return what went wrong: the command says it on stderr, once. Threads: any.
#pragma once

#include "platform/Log.h"

namespace tarn::ctl {

// Takes every line and keeps none.
class SilentLog final : public platform::Log {
 public:
  void write(const platform::LogEntry& /*entry*/) noexcept override {}
};

}  // namespace tarn::ctl
