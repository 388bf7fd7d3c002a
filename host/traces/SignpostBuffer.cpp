// SPDX-License-Identifier: Apache-2.0
#include "host/traces/SignpostBuffer.h"

#include <utility>

namespace tarn::linux_host {

SignpostBuffer::SignpostBuffer(std::size_t mostRecords, std::chrono::nanoseconds since, std::function<void()> halfFull)
    : mostRecords_(mostRecords), since_(since), halfFull_(std::move(halfFull)) {
  records_.reserve(mostRecords);  // so that taking one never allocates
}

void SignpostBuffer::take(const SignpostRecord& record) noexcept {
  if (record.at < since_) return;  // an interval whose begin the trace has not seen
  bool isHalfFull = false;
  {
    const MutexLock lock(mutex_);
    if (records_.size() >= mostRecords_) {
      ++lost_;
      return;
    }
    records_.push_back(record);
    isHalfFull = records_.size() == (mostRecords_ + 1) / 2;
  }
  if (isHalfFull) {
    halfFull_();
  }
}

SignpostBuffer::Content SignpostBuffer::drain(std::vector<SignpostRecord> spare) {
  spare.clear();
  spare.reserve(mostRecords_);
  const MutexLock lock(mutex_);
  return {std::exchange(records_, std::move(spare)), std::exchange(lost_, 0)};
}

}  // namespace tarn::linux_host
