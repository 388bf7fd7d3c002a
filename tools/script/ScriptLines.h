// SPDX-License-Identifier: Apache-2.0
// ScriptLines: the lines of a script that is read as it comes, so that a script of any length needs no more memory than
// its longest line.
//
// Owned by whoever plays the script, who waits for the descriptor and calls fill(). Threads: one at a time.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::script {

// next() until it is Incomplete, then fill(), and again; an end of the file without a line end closes the last line.
class ScriptLines {
 public:
  // A longer line is refused: no request may be as long. The service bounds frames by itself, at 1 MiB unless its
  // configuration says otherwise.
  static constexpr std::size_t kMaxLineBytes = std::size_t{16} << 20U;

  enum class Next {
    Line,        // the line is there
    Incomplete,  // fill() has to bring more
    End,         // there are no more lines
    TooLong,     // the next line is longer than kMaxLineBytes
  };

  // Reads from `fd`, which stays the caller's.
  explicit ScriptLines(int fd) : fd_(fd) {}
  ScriptLines(const ScriptLines&) = delete;
  ScriptLines& operator=(const ScriptLines&) = delete;

  // The next line without its line end; valid until the next call of either. The last line needs no line end. Never
  // reads. After TooLong there is no way on.
  Next next(std::string_view& line);
  // Reads once, waiting when there is nothing yet. 64 KiB at the most; an interrupted read is begun again. The error is
  // the system's.
  [[nodiscard]] Status fill();

  // Number of the line that next() gave last, or found too long; the first is 1.
  std::size_t lineNumber() const noexcept { return lineNumber_; }
  int fd() const noexcept { return fd_; }

 private:
  int fd_;
  // What was read and not given yet; lines that were given go at the next fill().
  std::string buffer_;
  std::size_t begin_ = 0;    // of the next line
  std::size_t scanned_ = 0;  // no line end lies before it
  std::size_t lineNumber_ = 0;
  bool ended_ = false;
};

}  // namespace tarn::script
