// Output: what the program says: results on stdout, complaints on stderr.
//
// A reader that has had enough (`| head`) closes the pipe; then the program is to end without a word, so the callers
// look at good() and isClosed() and nobody complains. SIGPIPE must be ignored. Threads: one.
#pragma once

#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::ctl {

class Output {
 public:
  // Writes to `fd`, which stays the caller's.
  explicit Output(int fd) : fd_(fd) {}
  Output(const Output&) = delete;
  Output& operator=(const Output&) = delete;

  // Writes one line now, printable() as a whole, which changes nothing of what a line of JSON says; its line end is
  // added. False once anything could not be written.
  bool line(std::string_view text);

  bool good() const noexcept { return failure_.ok(); }
  // The exit status that the output itself asks for: success while it is good, and when the reader simply left; else it
  // complains and says failure.
  int status() const;

 private:
  int fd_;
  std::string buffer_;
  Status failure_;
};

// Writes "tarnreportingctl: TEXT" to stderr, printable().
void complain(std::string_view text);

// Whether a place is named, by an option or by the environment; complains when not.
bool isNamed(const std::string& path, std::string_view option);

// The text with what a terminal would obey shown as a backslash, u and four hexadecimal digits; see
// plist::appendPrintable.
std::string printable(std::string_view text);

}  // namespace tarn::ctl
