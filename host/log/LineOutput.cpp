// SPDX-License-Identifier: Apache-2.0
#include "host/log/LineOutput.h"

#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>

#include "host/log/LogLine.h"

namespace tarn::linux_host {

namespace {

// A reader that is only slow makes room within this time.
constexpr int kPatienceMilliseconds = 100;

bool hasRoom(int target) {
  pollfd waiting{target, POLLOUT, 0};
  return ::poll(&waiting, 1, kPatienceMilliseconds) != 0;
}

}  // namespace

std::string LineOutput::formed(double epochSeconds, const platform::LogEntry& entry) const {
  return logLine(epochSeconds, entry);
}

int LineOutput::write(std::string_view bytes) {
  const int target = descriptor();
  if (target < 0) return -target;
  while (written_ < bytes.size()) {
    if (mayStall_ && !hasRoom(target)) return EAGAIN;
    const std::string_view left = bytes.substr(written_);
    // A pipe with any room takes this much, and no more than this in one piece.
    const ssize_t written =
        ::write(target, left.data(), mayStall_ ? std::min<std::size_t>(left.size(), PIPE_BUF) : left.size());
    if (written >= 0) {
      written_ += static_cast<std::size_t>(written);
    } else if (errno != EINTR) {
      return errno;
    }
  }
  written_ = 0;
  return 0;
}

StreamOutput::StreamOutput(int descriptor) : descriptor_(descriptor) {
  struct stat facts {};
  setMayStall(::fstat(descriptor, &facts) == 0 && !S_ISREG(facts.st_mode));
}

}  // namespace tarn::linux_host
