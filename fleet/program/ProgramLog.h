// SPDX-License-Identifier: Apache-2.0
// The log of a program of the fleet: lines on stderr, which the service manager keeps. Threads: any.
#pragma once

#include <cstdint>
#include <cstdio>
#include <string>
#include <utility>

#include "plist/EscapedText.h"

namespace tarn::fleet {

enum class LogLevel : std::uint8_t { Debug, Default, Error };

class ProgramLog {
 public:
  ProgramLog(std::string program, LogLevel least) : program_(std::move(program)), least_(least) {}

  void write(LogLevel level, const std::string& text) const {
    if (level < least_) return;
    std::string line = program_ + ": ";
    plist::appendPrintable(line, text, plist::LineEnds::Escaped);
    line += '\n';
    std::fputs(line.c_str(), stderr);
  }

 private:
  std::string program_;
  LogLevel least_;
};

}  // namespace tarn::fleet
