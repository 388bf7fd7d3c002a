#include "platform/linux/LineLog.h"

#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <exception>

#include "platform/linux/HostLog.h"
#include "platform/linux/LogLine.h"

namespace tarn::linux_host {

LineLog::LineLog(const platform::Clock& clock, platform::LogLevel threshold) : clock_(clock) {
  setThreshold(threshold);
}

void LineLog::write(const platform::LogEntry& entry) noexcept {
  try {
    const std::string line = logLine(clock_.epochSeconds(), entry);
    const std::lock_guard lock(mutex_);
    int error = lost_ == 0 ? 0 : writeLost();
    if (error == 0) {
      error = writeWhole(line);
    }
    if (error != 0) {
      ++lost_;
      lostError_ = error;
    }
  } catch (const std::exception&) {  // no memory for a line
    const std::lock_guard lock(mutex_);
    ++lost_;
    lostError_ = ENOMEM;
  }
}

std::uint64_t LineLog::lostLines() const {
  const std::lock_guard lock(mutex_);
  return lost_;
}

int LineLog::writeLost() {
  const std::string text = std::to_string(lost_) + " log lines were lost" + errorSuffix(lostError_);
  const int error = writeWhole(logLine(clock_.epochSeconds(), {kHostCategory, platform::LogLevel::Error, {}, 0, text}));
  if (error == 0) {
    lost_ = 0;
  }
  return error;
}

// 0 or an errno value. A line after a torn one begins on a line of its own.
int LineLog::writeWhole(std::string_view line) {
  const int target = descriptor();
  if (target < 0) {
    return -target;
  }
  std::string mended;
  if (torn_) {
    mended = "\n";
    mended += line;
    line = mended;
  }
  std::string_view left = line;
  while (!left.empty()) {
    const ssize_t written = ::write(target, left.data(), left.size());
    if (written >= 0) {
      left.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno == EAGAIN) {
      pollfd waiting{target, POLLOUT, 0};
      ::poll(&waiting, 1, -1);
    } else if (errno != EINTR) {
      const int error = errno;
      torn_ = torn_ ? left.size() + 1 != line.size() : left.size() != line.size();
      return error;
    }
  }
  torn_ = false;
  return 0;
}

}  // namespace tarn::linux_host
