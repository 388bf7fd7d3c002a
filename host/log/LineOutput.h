// SPDX-License-Identifier: Apache-2.0
// LineOutput: log lines to a descriptor: what the standard error stream and a log file have in common.
//
// A line is written whole, so that those of several processes that share the descriptor don't mix; one that is cut off
// by a full disk or a slow reader is carried on where it stopped. Threads: the log's own.
//
// A reader that stalls is waited for 100 ms at a time; then write() says EAGAIN, and the log, which can be asked to
// end, decides whether to come again. To such a descriptor no more than PIPE_BUF bytes go in one call, which a pipe
// with any room takes in one piece.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "host/log/LogOutput.h"

namespace tarn::linux_host {

class LineOutput : public LogOutput {
 public:
  LineOutput(const LineOutput&) = delete;
  LineOutput& operator=(const LineOutput&) = delete;

  // The line as LogLine makes it, with its line end.
  std::string formed(double epochSeconds, const platform::LogEntry& entry) const final;
  // Carries on with the same bytes after an error, by what written_ remembers; the log never comes with other bytes in
  // between.
  int write(std::string_view bytes) final;

 protected:
  LineOutput() = default;

  // Where the next bytes go, or a negative errno value, which write() returns as the error. Asked once a line or try;
  // it stays the deriving class's.
  virtual int descriptor() = 0;
  // Of another descriptor than before: a line that was begun there is started again.
  void beginAnew() noexcept { written_ = 0; }
  // For a descriptor other than a file's: it may be full for as long as its reader likes.
  void setMayStall(bool mayStall) noexcept { mayStall_ = mayStall; }

 private:
  // Whether room is asked for before each piece, a system call that a file doesn't need.
  bool mayStall_ = false;
  std::size_t written_ = 0;  // of the line that is being written
};

// The standard error stream, or another descriptor that is open already. It isn't closed. What kind of thing it is (a
// file or not) is looked at once, when this is made.
class StreamOutput final : public LineOutput {
 public:
  explicit StreamOutput(int descriptor);

 private:
  int descriptor() override { return descriptor_; }

  const int descriptor_;
};

}  // namespace tarn::linux_host
