// LineLog: a log sink that writes lines to a descriptor; what stderr and a log file have in common.
//
// Each entry is one write, so that entries of several threads, and of several processes that append to one file, stay
// whole. A line that can't be written (a full disk, a closed pipe) is counted as lost; the first line that can be
// written again is led by one that says how many were lost and why. A pipe that nobody empties slows its writers down,
// and after a second is taken for broken until it has room again: a stuck reader of the log must not stop the service.
// Threads: any.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class LineLog : public platform::Log {
 public:
  LineLog(const LineLog&) = delete;
  LineLog& operator=(const LineLog&) = delete;

  void write(const platform::LogEntry& entry) noexcept final;

 protected:
  LineLog(const platform::Clock& clock, platform::LogLevel threshold);

  // Where the next line goes, or a negative errno value. Called with the sink locked.
  virtual int descriptor() = 0;
  // For a descriptor other than a file's: it may be full for as long as its reader likes.
  void setMayStall(bool mayStall) noexcept { mayStall_ = mayStall; }

 private:
  int writeWhole(std::string_view line) TARN_REQUIRES(mutex_);
  int writeLost() TARN_REQUIRES(mutex_);
  bool waitForRoom(int target) const TARN_REQUIRES(mutex_);

  const platform::Clock& clock_;
  bool mayStall_ = false;  // constant after construction
  Mutex mutex_;
  std::uint64_t lost_ TARN_GUARDED_BY(mutex_) = 0;
  int lostError_ TARN_GUARDED_BY(mutex_) = 0;
  bool torn_ TARN_GUARDED_BY(mutex_) = false;  // the last line was cut off in the middle
};

// The standard error stream, or another descriptor that is open already. It isn't closed.
class StreamLog final : public LineLog {
 public:
  StreamLog(int descriptor, const platform::Clock& clock, platform::LogLevel threshold);

 private:
  int descriptor() override { return descriptor_; }

  const int descriptor_;
};

}  // namespace tarn::linux_host
