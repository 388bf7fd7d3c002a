// SPDX-License-Identifier: Apache-2.0
// OutputCapture: an Output whose lines a test reads.
#pragma once

#include <sys/mman.h>
#include <unistd.h>

#include <string>

#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

class OutputCapture {
 public:
  OutputCapture() : fd_(::memfd_create("output", MFD_CLOEXEC)), output_(fd_) {}
  ~OutputCapture() { ::close(fd_); }
  OutputCapture(const OutputCapture&) = delete;
  OutputCapture& operator=(const OutputCapture&) = delete;

  Output& output() { return output_; }
  // All that was printed by now.
  std::string text() const {
    std::string all(1U << 16U, '\0');
    const ssize_t size = ::pread(fd_, all.data(), all.size(), 0);
    all.resize(size > 0 ? static_cast<std::size_t>(size) : 0);
    return all;
  }

 private:
  int fd_;
  Output output_;
};

}  // namespace tarn::ctl
