// SPDX-License-Identifier: Apache-2.0
// SignpostBuffer: what one trace has recorded and not yet written. Bounded: while it is full, what comes is counted and
// left out, so a slow disk costs the trace events and the service nothing.
//
// Owner: the trace; LinuxSignposts shares it while it records. Threads: any.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <vector>

#include "platform/Signposts.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

// One event of a trace: plain data of less than a hundred bytes, whose texts are the program's and aren't copied.
struct SignpostRecord {
  // What it tells of; the texts outlive every trace.
  platform::Signpost signpost;
  std::chrono::nanoseconds at{};          // of the monotonic clock
  std::chrono::nanoseconds duration{-1};  // of an interval; negative: a mark
  std::int32_t thread = 0;                // the kernel's number
};

class SignpostBuffer {
 public:
  // What one drain brings.
  struct Content {
    std::vector<SignpostRecord> records;  // in the order in which they were taken
    std::uint64_t lost = 0;               // how many found no room after them
  };

  // Takes what happens from `since` on, and at most `mostRecords`, for which the room is made here. `halfFull` is
  // called each time the buffer has become so, on the thread that records, with no lock of this held; it must be as
  // cheap as a wake-up.
  SignpostBuffer(std::size_t mostRecords, std::chrono::nanoseconds since, std::function<void()> halfFull);
  SignpostBuffer(const SignpostBuffer&) = delete;
  SignpostBuffer& operator=(const SignpostBuffer&) = delete;

  // Keeps the record, or counts it as lost when there is no room; one from before `since` is dropped uncounted, as no
  // part of this trace. Neither allocates nor blocks for longer than drain() takes to swap two lists.
  void take(const SignpostRecord& record) noexcept;
  // Hands out what was taken and how many were lost since the last call; `spare`, what was handed out before, gives its
  // memory for what comes, so that a running trace allocates nothing after its first two.
  Content drain(std::vector<SignpostRecord> spare = {});

 private:
  // Constant from the making on.
  const std::size_t mostRecords_;
  const std::chrono::nanoseconds since_;
  const std::function<void()> halfFull_;
  Mutex mutex_;
  // With room for all that may come between two drains.
  std::vector<SignpostRecord> records_ TARN_GUARDED_BY(mutex_);
  std::uint64_t lost_ TARN_GUARDED_BY(mutex_) = 0;
};

}  // namespace tarn::linux_host
