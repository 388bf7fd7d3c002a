// SPDX-License-Identifier: Apache-2.0
// PseudoTerminal: what a program writes to a terminal, and a terminal for it to write to. Threads: one at a time.
#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <string>

namespace tarn::e2e {

class PseudoTerminal {
 public:
  PseudoTerminal(unsigned short columns, unsigned short rows) : ours_(::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC)) {
    EXPECT_EQ(::grantpt(ours_), 0);
    EXPECT_EQ(::unlockpt(ours_), 0);
    name_ = ::ptsname(ours_);
    theirs_ = ::open(name_.c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC);
    EXPECT_GE(theirs_, 0);
    const winsize size{rows, columns, 0, 0};
    EXPECT_EQ(::ioctl(theirs_, TIOCSWINSZ, &size), 0);
    ::fcntl(ours_, F_SETFL, O_NONBLOCK);
  }
  ~PseudoTerminal() {
    ::close(theirs_);
    ::close(ours_);
  }
  PseudoTerminal(const PseudoTerminal&) = delete;
  PseudoTerminal& operator=(const PseudoTerminal&) = delete;

  // For the program: what it writes to, and its name, for a shell that opens it.
  int fd() const { return theirs_; }
  const std::string& name() const { return name_; }
  // All that was written so far; a line's end is "\r\n".
  const std::string& written() {
    std::array<char, 4096> bytes{};
    for (ssize_t count = 0; (count = ::read(ours_, bytes.data(), bytes.size())) > 0;) {
      written_.append(bytes.data(), static_cast<std::size_t>(count));
    }
    return written_;
  }

 private:
  int ours_;
  int theirs_ = -1;
  std::string name_;
  std::string written_;
};

}  // namespace tarn::e2e
