// SPDX-License-Identifier: Apache-2.0
// The adapter's log: lines on stderr, which the service manager keeps.
#pragma once

#include <cstdio>
#include <string>

#include "adapters/pipewire/AdapterOptions.h"
#include "plist/EscapedText.h"

namespace tarn::streams {

// Threads: any.
class AdapterLog {
 public:
  AdapterLog(Adapter adapter, LogLevel least) : adapter_(adapter), least_(least) {}

  void write(LogLevel level, const std::string& text) const {
    if (level < least_) return;
    std::string line = programOf(adapter_) + std::string(": ");
    plist::appendPrintable(line, text, plist::LineEnds::Escaped);
    line += '\n';
    std::fputs(line.c_str(), stderr);
  }

 private:
  Adapter adapter_;
  LogLevel least_;
};

}  // namespace tarn::streams
