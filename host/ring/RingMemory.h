// SPDX-License-Identifier: Apache-2.0
// RingMemory: the memory of a client's ring, checked and mapped.
//
// The client is not trusted: its file must be memory that can't shrink (reading a page that is gone would end the
// process), of a size that a ring may have. The size is asked of the system once and kept.
//
// Owned by a ring's reader. Threads: one at a time.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <optional>

#include "clients/ring/RingLayout.h"
#include "host/ring/RingCounts.h"

namespace tarn::linux_host {

// Which memory file it is, whatever descriptor leads to it. Its number isn't used again while it is mapped.
struct RingIdentity {
  dev_t device = 0;
  ino_t inode = 0;
  bool operator==(const RingIdentity&) const = default;
};

class RingMemory {
 public:
  RingMemory() = default;
  RingMemory(RingMemory&& other) noexcept { swap(other); }
  RingMemory& operator=(RingMemory&& other) noexcept {
    swap(other);
    return *this;
  }
  RingMemory(const RingMemory&) = delete;
  RingMemory& operator=(const RingMemory&) = delete;
  ~RingMemory();

  // Maps the file, for reading and writing and with all its pages present; what is wrong with it, or nothing. It must
  // be memory of ordinary pages (large ones may be missing when they are touched), sealed against shrinking, growing
  // and other seals, as long as a header and a power of two, with a header that says so. The descriptor may be closed
  // afterwards; the mapping holds the file. A mapping from before is given up.
  [[nodiscard]] std::optional<RingFault> map(int descriptor);
  // Nothing of the memory may be looked at afterwards. The destructor does it too.
  void unmap() noexcept;

  // Shared with the client, who may change every byte at any moment: read it word by word, once, and check what was
  // read. Only after map().
  tarnring_header* header() const noexcept { return static_cast<tarnring_header*>(mapping_); }
  std::byte* data() const noexcept { return static_cast<std::byte*>(mapping_) + TARNRING_HEADER_BYTES; }
  // Bytes of the area behind the header, as the file's size said when it was mapped; the header's own number isn't
  // used.
  std::uint32_t dataBytes() const noexcept { return dataBytes_; }
  // Of the file that is mapped.
  const RingIdentity& identity() const noexcept { return identity_; }

 private:
  void swap(RingMemory& other) noexcept;

  // Null before map(); header and data area behind it.
  void* mapping_ = nullptr;
  std::uint32_t dataBytes_ = 0;
  RingIdentity identity_;
};

// Whether the descriptor is an eventfd, by what /proc calls it. Another kind would be ready to read for ever, or never.
bool isEventDescriptor(int descriptor);

}  // namespace tarn::linux_host
