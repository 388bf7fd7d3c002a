// SPDX-License-Identifier: Apache-2.0
// LinuxSignposts: hands the signposts that are set to the traces that record.
//
// While nothing records, nobody comes here: the switch is the interface's. While something does, a signpost costs two
// looks at the clock, the lock, and a copy into each trace's buffer; nothing is allocated and no disk is waited for.
//
// Owner: the platform; it outlives every trace. Threads: any, with one lock while something records.
#pragma once

#include <memory>
#include <vector>

#include "host/traces/SignpostBuffer.h"
#include "platform/Clock.h"
#include "platform/Signposts.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class LinuxSignposts final : public platform::Signposts {
 public:
  // The clock outlives this.
  explicit LinuxSignposts(const platform::Clock& clock) : clock_(clock) {}

  // On the monotonic clock, which is also that of the events in the files.
  std::chrono::nanoseconds begin() noexcept override { return clock_.monotonic(); }
  // Each trace takes the interval whose begin it has seen; one that began to record in between doesn't.
  void end(const platform::Signpost& signpost, std::chrono::nanoseconds began) noexcept override;
  void mark(const platform::Signpost& signpost) noexcept override;

  // From now on the buffer takes what is set, and isRecording() is true.
  void add(std::shared_ptr<SignpostBuffer> buffer);
  // The buffer takes no more once this has returned. With the last one isRecording() is false. One that isn't listed is
  // ignored.
  void remove(const SignpostBuffer* buffer) noexcept;

 private:
  // To all buffers, under the lock: a trace that is being removed waits for it.
  void take(const SignpostRecord& record) noexcept;

  const platform::Clock& clock_;
  Mutex mutex_;
  // Those of the traces that record, a handful at the most.
  std::vector<std::shared_ptr<SignpostBuffer>> buffers_ TARN_GUARDED_BY(mutex_);
};

}  // namespace tarn::linux_host
