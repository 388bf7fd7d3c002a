#include "host/log/LineLog.h"

#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <exception>

#include "host/log/HostLog.h"
#include "host/log/LogLine.h"

namespace tarn::linux_host {

namespace {

constexpr int kPatienceMilliseconds = 1000;

}  // namespace

LineLog::LineLog(const platform::Clock& clock, platform::LogLevel threshold) : clock_(clock) {
  setThreshold(threshold);
}

void LineLog::write(const platform::LogEntry& entry) noexcept {
  try {
    const std::string line = logLine(clock_.epochSeconds(), entry);
    const platform::MutexLock lock(mutex_);
    int error = lost_ == 0 ? 0 : writeLost();
    if (error == 0) {
      error = writeWhole(line);
    }
    if (error != 0) {
      ++lost_;
      lostError_ = error;
    }
  } catch (const std::exception&) {  // no memory for a line
    const platform::MutexLock lock(mutex_);
    ++lost_;
    lostError_ = ENOMEM;
  }
}

int LineLog::writeLost() {
  const std::string text =
      prefixed("LineLog", std::to_string(lost_) + " log lines were lost" + errorSuffix(lostError_));
  const int error = writeWhole(logLine(clock_.epochSeconds(), {kHostCategory, platform::LogLevel::Error, {}, 0, text}));
  if (error == 0) {
    lost_ = 0;
  }
  return error;
}

// 0 or an errno value. A line after a torn one begins on a line of its own.
int LineLog::writeWhole(std::string_view line) {
  const int target = descriptor();
  if (target < 0) return -target;
  std::string mended;
  if (torn_) {
    mended = "\n";
    mended += line;
    line = mended;
  }
  std::string_view left = line;
  const auto failed = [&](int error) TARN_REQUIRES(mutex_) {
    torn_ = torn_ ? left.size() + 1 != line.size() : left.size() != line.size();
    return error;
  };
  while (!left.empty()) {
    if (mayStall_ && !waitForRoom(target)) return failed(EAGAIN);
    // A pipe with any room takes this much, and no more than this in one piece.
    const ssize_t written =
        ::write(target, left.data(), mayStall_ ? std::min<std::size_t>(left.size(), PIPE_BUF) : left.size());
    if (written >= 0) {
      left.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno == EAGAIN) {
      if (!waitForRoom(target)) return failed(EAGAIN);
    } else if (errno != EINTR) {
      return failed(errno);
    }
  }
  torn_ = false;
  return 0;
}

// Whether there is room, for which only the first line in a row is waited for.
bool LineLog::waitForRoom(int target) const {
  pollfd waiting{target, POLLOUT, 0};
  return ::poll(&waiting, 1, lost_ == 0 ? kPatienceMilliseconds : 0) != 0;
}

StreamLog::StreamLog(int descriptor, const platform::Clock& clock, platform::LogLevel threshold)
    : LineLog(clock, threshold), descriptor_(descriptor) {
  struct stat facts {};
  setMayStall(::fstat(descriptor, &facts) == 0 && !S_ISREG(facts.st_mode));
}

}  // namespace tarn::linux_host
