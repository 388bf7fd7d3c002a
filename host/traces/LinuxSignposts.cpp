// SPDX-License-Identifier: Apache-2.0
#include "host/traces/LinuxSignposts.h"

#include <unistd.h>

#include <utility>

namespace tarn::linux_host {

namespace {

std::int32_t ownThread() noexcept {
  thread_local const std::int32_t number = ::gettid();
  return number;
}

}  // namespace

void LinuxSignposts::end(const platform::Signpost& signpost, std::chrono::nanoseconds began) noexcept {
  take({signpost, began, clock_.monotonic() - began, ownThread()});
}

void LinuxSignposts::mark(const platform::Signpost& signpost) noexcept {
  take({signpost, clock_.monotonic(), std::chrono::nanoseconds(-1), ownThread()});
}

void LinuxSignposts::add(std::shared_ptr<SignpostBuffer> buffer) {
  const MutexLock lock(mutex_);
  buffers_.push_back(std::move(buffer));
  setRecording(true);
}

void LinuxSignposts::remove(const SignpostBuffer* buffer) noexcept {
  const MutexLock lock(mutex_);
  std::erase_if(buffers_, [buffer](const auto& listed) { return listed.get() == buffer; });
  setRecording(!buffers_.empty());
}

void LinuxSignposts::take(const SignpostRecord& record) noexcept {
  const MutexLock lock(mutex_);
  for (const auto& buffer : buffers_) {
    buffer->take(record);
  }
}

}  // namespace tarn::linux_host
