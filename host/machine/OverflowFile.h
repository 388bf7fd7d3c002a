// SPDX-License-Identifier: Apache-2.0
// OverflowFile: the overflow store of a machine with a disk, one file in the state directory.
//
// The file has no name from the moment on when it is there, so whatever ends the process takes it along. It is made
// when the first block is to be kept. A block lies in slots of a page of the disk each, the first that are free; what
// is free is given back to the disk. The file may take its share of the disk and no more: then it is as if the disk
// were full.
//
// Owned by the platform. Threads: any.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "host/system/UniqueDescriptor.h"
#include "platform/OverflowStore.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class OverflowFile final : public platform::OverflowStore {
 public:
  static constexpr std::size_t kSlotBytes = 4096;

  // Takes at most `share` bytes in the folder. Removes what a process that was killed may have left there.
  OverflowFile(std::string folder, const Bounds& bounds, std::size_t share);

  const Bounds& bounds() const override { return bounds_; }
  // Other bounds and another share from now on. What the file has beyond its share it keeps. On the server queue.
  void setBounds(const Bounds& bounds, std::size_t share) noexcept {
    bounds_ = bounds;
    share_ = share;
  }
  Result<Place> write(std::string_view bytes) override;
  Result<std::string> read(Place place) override;
  void remove(Place place) noexcept override;

  // Bytes that the file takes of the disk; whoever looks at it may live longer.
  std::shared_ptr<const std::atomic<std::int64_t>> size() const noexcept { return size_; }

 private:
  using Slots = std::vector<std::uint32_t>;  // in the block's order
  struct Block {
    Slots slots;
    std::size_t bytes = 0;
  };
  // Slots that lie one behind the other.
  struct Run {
    std::uint32_t first;
    std::uint32_t count;
  };

  Status open() TARN_REQUIRES(mutex_);
  // Takes slots for the bytes and writes them there. What was taken is in `slots`, also when that fails.
  Status fill(Slots& slots, std::string_view bytes);
  Status take(std::size_t count, Slots& slots, int& descriptor);
  void giveBack(const Slots& slots) noexcept;
  static Run runAt(const Slots& slots, std::size_t index) noexcept;

  const std::string folder_;
  Bounds bounds_;  // of the server queue alone
  std::atomic<std::size_t> share_;
  const std::shared_ptr<std::atomic<std::int64_t>> size_ = std::make_shared<std::atomic<std::int64_t>>(0);

  Mutex mutex_;
  UniqueDescriptor file_ TARN_GUARDED_BY(mutex_);
  std::unordered_map<Place, Block> blocks_ TARN_GUARDED_BY(mutex_);
  Place last_ TARN_GUARDED_BY(mutex_) = 0;
  std::uint32_t end_ TARN_GUARDED_BY(mutex_) = 0;  // behind the last slot that was ever used
  // A heap, the first slot on top; it has room for all there are, so that giving back never needs memory.
  Slots free_ TARN_GUARDED_BY(mutex_);
};

}  // namespace tarn::linux_host
