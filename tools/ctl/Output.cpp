#include "tools/ctl/Output.h"

#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <system_error>

#include "tools/ctl/ExitStatus.h"

namespace tarn::ctl {

bool Output::line(std::string_view text) {
  if (!good()) {
    return false;
  }
  buffer_.assign(text);
  buffer_ += '\n';
  std::string_view rest = buffer_;
  while (!rest.empty()) {
    const ssize_t count = ::write(fd_, rest.data(), rest.size());
    if (count >= 0) {
      rest.remove_prefix(static_cast<std::size_t>(count));
    } else if (errno != EINTR) {
      errorNumber_ = errno;
      return false;
    }
  }
  return true;
}

int Output::status() const {
  if (errorNumber_ == 0 || errorNumber_ == EPIPE) {
    return kSuccess;
  }
  complain("can't write the results: " + std::generic_category().message(errorNumber_));
  return kFailure;
}

void complain(std::string_view text) {
  const std::string line = "tarnreportingctl: " + std::string(text) + "\n";
  std::fwrite(line.data(), 1, line.size(), stderr);
}

bool isNamed(const std::string& path, std::string_view option) {
  if (path.empty()) {
    complain(std::string(option) + " must be given: the environment names no place to look at");
  }
  return !path.empty();
}

std::string printable(std::string_view text) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::string shown;
  shown.reserve(text.size());
  for (const char character : text) {
    const auto byte = static_cast<unsigned char>(character);
    if (byte >= 0x20 && byte != 0x7F) {
      shown += character;
    } else {
      shown += "\\x";
      shown += kDigits[byte >> 4U];
      shown += kDigits[byte & 0xFU];
    }
  }
  return shown;
}

}  // namespace tarn::ctl
