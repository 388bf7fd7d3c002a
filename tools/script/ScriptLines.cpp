// SPDX-License-Identifier: Apache-2.0
#include "tools/script/ScriptLines.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "host/system/SystemError.h"

namespace tarn::script {

namespace {
constexpr std::size_t kReadBytes = 65536;
}

ScriptLines::Next ScriptLines::next(std::string_view& line) {
  const std::size_t end = buffer_.find('\n', scanned_);
  const bool isWhole = end != std::string::npos;
  const std::size_t length = (isWhole ? end : buffer_.size()) - begin_;
  if (length > kMaxLineBytes) {
    ++lineNumber_;
    return Next::TooLong;
  }
  if (!isWhole && !ended_) {
    scanned_ = buffer_.size();
    return Next::Incomplete;
  }
  if (!isWhole && length == 0) return Next::End;
  line = std::string_view(buffer_).substr(begin_, length);
  begin_ += length + (isWhole ? 1 : 0);
  scanned_ = begin_;
  ++lineNumber_;
  return Next::Line;
}

Status ScriptLines::fill() {
  buffer_.erase(0, begin_);
  scanned_ -= begin_;
  begin_ = 0;
  const std::size_t held = buffer_.size();
  buffer_.resize(held + kReadBytes);
  ssize_t count = 0;
  do {
    count = ::read(fd_, buffer_.data() + held, kReadBytes);
  } while (count < 0 && errno == EINTR);
  buffer_.resize(held + static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
  if (count < 0) return linux_host::lastSystemError();
  ended_ = count == 0;
  return {};
}

}  // namespace tarn::script
