// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/Output.h"

#include <cerrno>
#include <cstdio>

#include "host/system/Files.h"
#include "plist/EscapedText.h"

namespace tarn::ctl {

namespace {

// Bytes that are worth a write.
constexpr std::size_t kMostWaiting = std::size_t{64} << 10;

// As it was called, where that is one of ours; it may be linked to anything that tests it.
std::string programName() {
  const std::string_view called = program_invocation_short_name;
  return std::string(called.starts_with("tarnreporting") ? called : "tarnreportingctl");
}

}  // namespace

bool Output::line(std::string_view text) {
  if (!good()) return false;
  plist::appendPrintable(buffer_, text, plist::LineEnds::Escaped);
  return endLine();
}

bool Output::paintedLine(std::string_view text) {
  if (!good()) return false;
  buffer_ += text;
  return endLine();
}

bool Output::endLine() {
  buffer_ += '\n';
  const bool mayWait = pace_ == Pace::Together && buffer_.size() < kMostWaiting;
  return mayWait ? good() : flush();
}

bool Output::flush() {
  if (good() && !buffer_.empty()) {
    failure_ = linux_host::writeAll(fd_, buffer_);
    buffer_.clear();
  }
  return good();
}

int Output::status() {
  if (flush() || failure_->code == EPIPE) return kSuccess;
  complain("can't write the results: " + failure_->text);
  return kFailure;
}

void complain(std::string_view text) {
  const std::string line = programName() + ": " + printable(text) + "\n";
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
