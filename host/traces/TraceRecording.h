// SPDX-License-Identifier: Apache-2.0
// TraceRecording: one performance trace, from the start that is asked for to its file.
//
// Owner: its session and, while it has work, the traces' thread. Threads: what a session asks for, any; the work, the
// traces' thread, on which the callbacks are made.
//
// A trace goes through New, Valid and Over once. What a session asks for changes the state at once, so that its answers
// don't wait for the thread; the work comes later and is done at most once.
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "host/traces/LinuxSignposts.h"
#include "host/traces/TraceFile.h"
#include "platform/Clock.h"
#include "platform/FileSystem.h"
#include "platform/Log.h"
#include "platform/PerformanceTraceService.h"
#include "platform/ProcessFacts.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

// What traces may cost: disk, memory and how much at once. Beyond them events are left out and counted.
struct PerformanceTraceLimits {
  std::size_t mostBytes = std::size_t{64} << 20U;          // of a file; some 450,000 events
  std::size_t mostBufferedEvents = std::size_t{1} << 15U;  // of a trace, about 100 bytes each
  std::size_t mostTraces = 4;                              // that record at once
  std::chrono::milliseconds drainInterval{100};            // how often buffers are emptied; sooner when half full
};

// What traces stand on; all of it outlives them.
struct TraceParts {
  LinuxSignposts& signposts;
  platform::FileSystem& fileSystem;
  const platform::Clock& clock;
  const platform::ProcessFacts& processFacts;
  platform::Log& log;
};

class TraceRecording {
 public:
  // The templates that there are, by the numbers that configurations name: intervals and marks; the same with arguments
  // and samples of the process's load.
  static constexpr std::int32_t kTemplateOfIntervals = 2;
  static constexpr std::int32_t kTemplateOfProfiles = 3;

  // `number` counts the traces of this process; token and file name hold it. Nothing is opened.
  TraceRecording(const TraceParts& parts, const PerformanceTraceLimits& limits, std::int32_t templateNumber,
                 std::uint64_t number);
  TraceRecording(const TraceRecording&) = delete;
  TraceRecording& operator=(const TraceRecording&) = delete;

  // What a session asks for. The delegate isn't kept alive; null takes it away. A callback that has begun goes on.
  void setDelegate(std::weak_ptr<platform::PerformanceTraceDelegate> delegate);
  // From the start that is asked for until a stop is, the start failed or the session let go.
  bool isValid() const;
  // 0 until the completion.
  std::uint64_t eventsLeftOut() const noexcept { return leftOut_; }
  // Whether the start (the stop) is to be carried out: at most once each, a stop only of a valid trace.
  bool askForStart();
  bool askForStop();
  // Records no more and begins no more callbacks; what is under way comes to its end. May be called on any thread and
  // again.
  void release() noexcept;

  // The work. Makes the folder and the file, begins to record and tells the delegate, with the error when something
  // failed: EBUSY without room, else the disk's. `wake` is called when the buffer should be emptied early; it outlives
  // the recording. A session that was let go of meanwhile leaves no file and is told nothing.
  void start(bool hasRoom, std::function<void()> wake);
  // Writes what the buffer holds, samples the load where the template asks for it, and flushes. A disk that refuses
  // ends the recording here; the completion tells why.
  void drain();
  // Ends the recording, drains, tells that it stopped, completes the file and tells where it is or why there is none.
  // Nothing when there is no file.
  void stop();
  // Removes an unfinished file, as when the session is let go of.
  void discard() noexcept { file_.reset(); }
  // Whether there is a file to be filled.
  bool isOpen() const noexcept { return file_ != nullptr; }

 private:
  enum class State {
    New,
    Valid,  // a start was asked for and has not failed
    Over,
  };

  // The folder "Audio/Traces" of the diagnostic logs is made where it is missing.
  Status openFile();
  // Whether the session still wants it; from here on signposts reach the buffer.
  bool beginRecording(std::function<void()> wake);
  // No signpost reaches the buffer any more; what it holds stays to be drained.
  void endRecording() noexcept;
  // Processor time in microseconds and memory in bytes, each as a counter event.
  void sampleLoad();
  // One line, when the trace lacks events, that says how many and why.
  void logLeftOut() const;
  // Makes a callback, unless the session was let go of. Without the lock, so that it may come back here.
  template <class Call>
  void tell(const Call& call);

  const TraceParts parts_;
  const PerformanceTraceLimits limits_;
  // Who it is: number and token count the traces of the process.
  const std::int32_t templateNumber_;
  const std::uint64_t number_;
  const std::string token_;

  // The traces' thread's own.
  std::unique_ptr<TraceFile> file_;
  // The room that the last drain's records took, for the next.
  std::vector<SignpostRecord> spare_;
  Status failure_;  // of the disk

  std::atomic<std::uint64_t> leftOut_{0};  // set before the completion
  mutable Mutex mutex_;
  std::weak_ptr<platform::PerformanceTraceDelegate> delegate_ TARN_GUARDED_BY(mutex_);
  std::shared_ptr<SignpostBuffer> buffer_ TARN_GUARDED_BY(mutex_);  // set once, when recording begins
  State state_ TARN_GUARDED_BY(mutex_) = State::New;
  bool released_ TARN_GUARDED_BY(mutex_) = false;
};

}  // namespace tarn::linux_host
