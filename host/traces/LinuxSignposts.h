// LinuxSignposts: hands the signposts that are set to the traces that record.
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

  std::chrono::nanoseconds begin() noexcept override { return clock_.monotonic(); }
  void end(const platform::Signpost& signpost, std::chrono::nanoseconds began) noexcept override;
  void mark(const platform::Signpost& signpost) noexcept override;

  // From now on the buffer takes what is set.
  void add(std::shared_ptr<SignpostBuffer> buffer);
  // The buffer takes no more once this has returned.
  void remove(const SignpostBuffer* buffer) noexcept;

 private:
  void take(const SignpostRecord& record) noexcept;

  const platform::Clock& clock_;
  Mutex mutex_;
  std::vector<std::shared_ptr<SignpostBuffer>> buffers_ TARN_GUARDED_BY(mutex_);
};

}  // namespace tarn::linux_host
