#include "tools/ctl/Output.h"

#include <cerrno>
#include <cstdio>

#include "host/system/Files.h"
#include "plist/Hex.h"
#include "tools/ctl/ExitStatus.h"

namespace tarn::ctl {

bool Output::line(std::string_view text) {
  if (!good()) return false;
  buffer_.assign(text);
  buffer_ += '\n';
  failure_ = linux_host::writeAll(fd_, buffer_);
  return good();
}

int Output::status() const {
  if (good() || failure_->code == EPIPE) return kSuccess;
  complain("can't write the results: " + failure_->text);
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
  std::string shown;
  shown.reserve(text.size());
  for (const char character : text) {
    const auto byte = static_cast<unsigned char>(character);
    if (byte >= 0x20 && byte != 0x7F) {
      shown += character;
    } else {
      shown += "\\x";
      plist::appendHex(shown, character);
    }
  }
  return shown;
}

}  // namespace tarn::ctl
