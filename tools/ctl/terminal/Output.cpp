// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/Output.h"

#include <cerrno>
#include <cstdio>

#include "host/system/Files.h"
#include "plist/EscapedText.h"

namespace tarn::ctl {

bool Output::line(std::string_view text) {
  if (!good()) return false;
  buffer_.clear();
  plist::appendPrintable(buffer_, text, plist::LineEnds::Escaped);
  return writeBuffer();
}

bool Output::paintedLine(std::string_view text) {
  if (!good()) return false;
  buffer_ = text;
  return writeBuffer();
}

bool Output::writeBuffer() {
  buffer_ += '\n';
  failure_ = linux_host::writeAll(fd_, buffer_);
  return good();
}

int Output::status() const {
  if (good() || failure_->code == EPIPE) return kSuccess;
  complain("can't write the results: " + failure_->text);
  return kFailure;
}

void complain(std::string_view text) {
  const std::string line = "tarnreportingctl: " + printable(text) + "\n";
  std::fwrite(line.data(), 1, line.size(), stderr);
}

bool isNamed(const std::string& path, std::string_view option) {
  if (path.empty()) {
    complain(std::string(option) + " must be given: the environment names no place to look at");
  }
  return !path.empty();
}

std::string printable(std::string_view text) {
  std::string shown;
  plist::appendPrintable(shown, text, plist::LineEnds::Escaped);
  return shown;
}

}  // namespace tarn::ctl
