// SPDX-License-Identifier: Apache-2.0
// Output: what the program says: results on stdout, complaints on stderr, and how it went by its exit status.
//
// A reader that has had enough (`| head`) closes the pipe; then the program is to end without a word, so the callers
// look at good() and isClosed() and nobody complains. SIGPIPE must be ignored. Threads: one.
#pragma once

#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::ctl {

// How the program ends. Part of its contract with scripts.
inline constexpr int kSuccess = 0;
inline constexpr int kFailure = 1;       // what no other number says
inline constexpr int kWrongUsage = 64;   // the command line
inline constexpr int kBadInput = 65;     // a script, a JSON text, a defaults file
inline constexpr int kUnreachable = 69;  // no service listens on the socket, or the connection to it broke

// Once a line failed, further ones are left out and the first failure is kept.
class Output {
 public:
  // When lines are written: each at once, or many together, for those who print thousands of them.
  enum class Pace { EachLine, Together };

  // Writes to `fd`, which stays the caller's.
  explicit Output(int fd, Pace pace = Pace::EachLine) : fd_(fd), pace_(pace) {}
  // Writes what still waits.
  ~Output() { flush(); }
  Output(const Output&) = delete;
  Output& operator=(const Output&) = delete;

  // Writes one line, printable() as a whole, which changes nothing of what a line of JSON says; its line end is
  // added. False once anything could not be written.
  bool line(std::string_view text);

  // The same for a line that was made printable part by part, so that paint may stand between them (Terminal).
  bool paintedLine(std::string_view text);

  // Writes the lines that wait. False once anything could not be written.
  bool flush();

  // Whether everything could be written so far. Who prints much looks at it between two lines.
  bool good() const noexcept { return failure_.ok(); }
  // Writes the lines that wait. The exit status that the output itself asks for: success while it is good, and when the
  // reader simply left; else it complains and says failure. Call it at the end, once: it complains each time.
  int status();

 private:
  // Its line end is added to what waits, which is written as the pace says.
  bool endLine();

  const int fd_;
  const Pace pace_;
  std::string buffer_;  // lines that wait
  Status failure_;
};

// Writes "tarnreportingctl: TEXT", or another program's name, to stderr, printable(). One line; what it says is a
// sentence without a full stop.
void complain(std::string_view text);

// Whether a place is named, by an option or by the environment; complains when not.
bool isNamed(const std::string& path, std::string_view option);

// The text with what a terminal would obey shown as a backslash, u and four hexadecimal digits; see
// plist::appendPrintable.
std::string printable(std::string_view text);

}  // namespace tarn::ctl
