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
  explicit AdapterLog(LogLevel least) : least_(least) {}

  void write(LogLevel level, const std::string& text) const {
    if (level < least_) return;
    std::string line = "tarnreporting-pipewire: ";
    plist::appendPrintable(line, text, plist::LineEnds::Escaped);
    line += '\n';
    std::fputs(line.c_str(), stderr);
  }

 private:
  LogLevel least_;
};

}  // namespace tarn::streams
