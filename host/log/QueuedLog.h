// QueuedLog: the log sink of the service. Whoever logs leaves the entry here and goes on; a thread of its own writes
// it.
//
// Which problem: a journal that stalls, a pipe that nobody reads, a full or hanging disk would each hold up whoever
// writes to them, and that is the server queue. So entries wait in memory, within a bound, and are tried again until
// the output takes them. When the bound is reached, further ones are lost and counted until all that waited is written;
// then one line tells how many and why:
//
//   write() -> [waiting, bounded] -> thread: output.write(), again after a pause -> "N log lines were lost: why"
//
// Owned by HostSetup; the output is its own. Threads: any.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "host/log/LogOutput.h"
#include "platform/Clock.h"
#include "platform/Log.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class QueuedLog final : public platform::Log {
 public:
  // What may wait, in bytes of formed entries.
  static constexpr std::size_t kMostBytes = std::size_t{1} << 20;

  // The clock outlives the log.
  QueuedLog(std::unique_ptr<LogOutput> output, const platform::Clock& clock, platform::LogLevel threshold,
            std::size_t mostBytes = kMostBytes);
  QueuedLog(const QueuedLog&) = delete;
  QueuedLog& operator=(const QueuedLog&) = delete;
  // Gives what waits a short last while, then ends the thread.
  ~QueuedLog() override;

  // Begins to write; what was logged before is kept for that.
  void start();
  void write(const platform::LogEntry& entry) noexcept override;
  // Waits until all that was logged is written, at most so long. Whether it is.
  bool settle(std::chrono::milliseconds longest);

 private:
  using Texts = std::vector<std::string>;

  void run();
  void writeAll(const Texts& texts);
  // Whether it was written, or never can be; false when the log ends.
  bool writeOne(const std::string& text);
  void lose() TARN_REQUIRES(mutex_);
  std::string lostLine(std::uint64_t lost, int error) const;
  bool allIsWritten() const TARN_REQUIRES(mutex_) { return bytes_ == 0 && lost_ == 0; }

  const std::unique_ptr<LogOutput> output_;
  const platform::Clock& clock_;
  const std::size_t mostBytes_;
  std::thread thread_;

  mutable Mutex mutex_;
  ConditionVariable work_;  // for the thread
  ConditionVariable done_;  // for those who wait for it
  Texts waiting_ TARN_GUARDED_BY(mutex_);
  std::size_t bytes_ TARN_GUARDED_BY(mutex_) = 0;  // of all that isn't written, also what the thread has taken
  std::uint64_t lost_ TARN_GUARDED_BY(mutex_) = 0;
  int error_ TARN_GUARDED_BY(mutex_) = 0;          // of the output, while it takes nothing
  int lostError_ TARN_GUARDED_BY(mutex_) = 0;      // why the lines are lost; 0: there were too many
  bool asleep_ TARN_GUARDED_BY(mutex_) = false;    // the thread waits for something to write
  bool stopping_ TARN_GUARDED_BY(mutex_) = false;  // no output is waited for any more
};

}  // namespace tarn::linux_host
