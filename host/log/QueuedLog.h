// SPDX-License-Identifier: Apache-2.0
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
  // What may wait, in bytes of formed entries: some ten thousand lines of ordinary length. One entry alone may be
  // larger.
  static constexpr std::size_t kMostBytes = std::size_t{1} << 20;

  // The clock, which stamps the entries when they are logged, outlives the log. Nothing is written before start();
  // entries below `threshold` are left out by those who log, as everywhere.
  QueuedLog(std::unique_ptr<LogOutput> output, const platform::Clock& clock, platform::LogLevel threshold,
            std::size_t mostBytes = kMostBytes);
  QueuedLog(const QueuedLog&) = delete;
  QueuedLog& operator=(const QueuedLog&) = delete;
  // Gives what waits a last while of 200 ms, then ends the thread; what isn't written by then is lost, and nobody is
  // left to be told. So a reader that stalls never keeps the process from ending.
  ~QueuedLog() override;

  // Entries below it are left out from now on. Threads: any.
  void setLevel(platform::LogLevel level) noexcept { setThreshold(level); }

  // Begins to write, on the thread that this makes; what was logged before is kept for that. To be called once; throws
  // when the system has no thread to give.
  void start();
  // Forms the entry and leaves it; costs a lock and now and then the wake of the thread, and waits for no output. Also
  // loses it, counted: with the bound reached, or without memory. Once entries are lost all are until what waited is
  // written, so that what is told about them has one place in the log.
  void write(const platform::LogEntry& entry) noexcept override;
  // Waits until all that was logged, and the account of what was lost, is written, at most so long. Whether it is.
  // Others may go on logging meanwhile; what they log is waited for too.
  bool settle(std::chrono::milliseconds longest);

 private:
  using Texts = std::vector<std::string>;

  // The thread: takes all that waits at once, writes it without the lock, and sleeps when there is nothing.
  void run();
  // In their order; stops early only when the log ends. The bytes count as waiting until they are written, or the bound
  // would let twice as much wait.
  void writeAll(const Texts& texts);
  // Tries until it is written or never can be; false when the log ends. Between two tries it pauses, from 5 ms, doubled
  // up to 500 ms: an output may be away for hours, and back at any time.
  bool writeOne(const std::string& text);
  // Counts one and keeps why.
  void lose() TARN_REQUIRES(mutex_);
  // The entry that tells how many were lost and why, with the level error.
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
