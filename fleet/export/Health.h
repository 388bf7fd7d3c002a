// SPDX-License-Identifier: Apache-2.0
// Health: says how the exporter fares: the log is told when that changes, the service manager has a line of it, and a
// file keeps the last error for --status.
//
//   OWN/error       "SECONDS TEXT": when messages were last refused, and why
//
// Owner: the program. Threads: one.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <ostream>
#include <string>

#include "fleet/export/ExportOptions.h"
#include "fleet/export/Exporter.h"
#include "fleet/program/ProgramLog.h"
#include "host/loop/ServiceManager.h"

namespace tarn::fleet {

class Health {
 public:
  // `own`: the program's directory. What it is handed outlives it.
  Health(const ProgramLog& log, linux_host::ServiceManager& manager, std::string own)
      : log_(log), manager_(manager), errorFile_(own + "/error") {}

  void note(const Exporter& exporter, const SendWindow& window, const ExportClock& now);
  // A fault of the store or the disk, once until it is another one.
  void note(const Status& status);

 private:
  using Time = std::chrono::nanoseconds;

  void keepError(const std::string& text, const ExportClock& now);
  void tellManager(const Exporter& exporter, const ExportClock& now);

  const ProgramLog& log_;
  linux_host::ServiceManager& manager_;
  const std::string errorFile_;
  bool fails_ = false;
  Time since_{};  // when that began
  Time nextKept_{};
  Time nextTold_{};
  std::string fault_, keptError_, told_;
};

// One JSON object about the program of these options, which may run or not: how far it is, how old the oldest event is
// that hasn't arrived, the last success and the last error. `now`: epoch seconds. The error is that of its files or of
// the store.
[[nodiscard]] Status showStatus(const ExportOptions& options, Mode mode, StoreTail& store, double now,
                                std::ostream& out);

}  // namespace tarn::fleet
