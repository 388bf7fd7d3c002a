// SPDX-License-Identifier: Apache-2.0
// InputFile: a file to read, or standard input for "-". Closes what it opened. Threads: one.
#pragma once

#include <fcntl.h>
#include <unistd.h>

#include <string>

namespace tarn::ctl {

// Opens for reading alone, and so that no child inherits it.
class InputFile {
 public:
  // A failure is told by fd(): the caller says what the file was for.
  explicit InputFile(const std::string& path)
      : isStandardInput_(path == "-"),
        fd_(isStandardInput_ ? STDIN_FILENO : ::open(path.c_str(), O_RDONLY | O_CLOEXEC)) {}
  // Standard input stays open.
  ~InputFile() {
    if (!isStandardInput_ && fd_ >= 0) {
      ::close(fd_);
    }
  }
  InputFile(const InputFile&) = delete;
  InputFile& operator=(const InputFile&) = delete;

  // Negative when it can't be opened; errno tells why.
  int fd() const { return fd_; }
  // For complaints, which call it "stdin".
  bool isStandardInput() const { return isStandardInput_; }

 private:
  bool isStandardInput_;
  int fd_;
};

}  // namespace tarn::ctl
