// SPDX-License-Identifier: Apache-2.0
// FakeOverflowStore: an overflow store in memory, with faults. Its bounds are those of a service unless a test sets
// others before the first session is made. Threads: any, but for the controls.
#pragma once

#include <cstddef>
#include <functional>
#include <limits>
#include <map>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>

#include "platform/OverflowStore.h"

namespace tarn::testing {

class FakeOverflowStore final : public platform::OverflowStore {
 public:
  const Bounds& bounds() const override { return bounds_; }
  Result<Place> write(std::string_view bytes) override {
    const std::lock_guard guard(mutex_);
    ++writesTried_;
    if (isFull_) return {0, Error{28, "No space left on device"}};
    kept_.emplace(++last_, bytes);
    ++written_;
    if (onWrite_) {
      std::size_t sum = 0;
      for (const auto& [place, block] : kept_) {
        sum += block.size();
      }
      onWrite_(sum);
    }
    return {last_, {}};
  }
  Result<std::string> read(Place place) override {
    const std::lock_guard guard(mutex_);
    ++read_;
    if (failsReads_) return {{}, Error{5, "Input/output error"}};
    const auto found = kept_.find(place);
    if (found == kept_.end()) return {{}, Error{2, "nothing is kept there"}};
    return {found->second, {}};
  }
  void remove(Place place) noexcept override {
    const std::lock_guard guard(mutex_);
    kept_.erase(place);
  }

  // Controls.
  void setBounds(std::size_t bytesOfSession, std::size_t bytesInAll,
                 std::size_t bytesOfUser = std::numeric_limits<std::size_t>::max()) {
    bounds_ = {bytesOfSession, bytesInAll, bytesOfUser};
  }
  void setFull(bool isFull) { isFull_ = isFull; }
  void setFailsReads(bool fails) { failsReads_ = fails; }
  // Called for each block that is written with the bytes that are kept now.
  void setOnWrite(std::function<void(std::size_t)> onWrite) { onWrite_ = std::move(onWrite); }
  // Changes a byte in the middle of each block.
  void damage() {
    const std::lock_guard guard(mutex_);
    for (auto& [place, bytes] : kept_) {
      bytes[bytes.size() / 2] = static_cast<char>(bytes[bytes.size() / 2] ^ 1);
    }
  }

  // Observations: blocks that are kept, and how often something was written, tried to be, and read.
  std::size_t blocks() const {
    const std::lock_guard guard(mutex_);
    return kept_.size();
  }
  std::size_t bytes() const {
    const std::lock_guard guard(mutex_);
    std::size_t sum = 0;
    for (const auto& [place, bytes] : kept_) {
      sum += bytes.size();
    }
    return sum;
  }
  std::size_t written() const { return written_; }
  std::size_t writesTried() const { return writesTried_; }
  std::size_t blocksRead() const { return read_; }

 private:
  mutable std::mutex mutex_;
  Bounds bounds_{std::size_t{64} << 20U, std::size_t{256} << 20U};
  std::map<Place, std::string> kept_;
  Place last_ = 0;
  std::size_t written_ = 0;
  std::size_t writesTried_ = 0;
  std::size_t read_ = 0;
  bool isFull_ = false;
  bool failsReads_ = false;
  std::function<void(std::size_t)> onWrite_;
};

}  // namespace tarn::testing
