// SPDX-License-Identifier: Apache-2.0
// UniqueDescriptor: owns one file descriptor and closes it at its end. What doesn't own one takes an `int`, so a
// signature tells who closes.
//
// -1 stands for none, so it can be made straight of open(2)'s result and asked afterwards; errno is that of the call as
// long as nothing was owned before. An error of close(2) is not told: whoever needs to know syncs first. Threads: one
// at a time.
#pragma once

#include <unistd.h>

#include <utility>

namespace tarn::linux_host {

class UniqueDescriptor {
 public:
  UniqueDescriptor() noexcept = default;
  // Takes it over; a negative one is none.
  explicit UniqueDescriptor(int descriptor) noexcept : descriptor_(descriptor) {}
  // The other one has none afterwards.
  UniqueDescriptor(UniqueDescriptor&& other) noexcept : descriptor_(std::exchange(other.descriptor_, -1)) {}
  // Closes the own one first.
  UniqueDescriptor& operator=(UniqueDescriptor&& other) noexcept {
    if (this != &other) {
      reset();
      descriptor_ = std::exchange(other.descriptor_, -1);
    }
    return *this;
  }
  UniqueDescriptor(const UniqueDescriptor&) = delete;
  UniqueDescriptor& operator=(const UniqueDescriptor&) = delete;
  ~UniqueDescriptor() { reset(); }

  // -1 when there is none. Valid only as long as this object owns it: after reset() the number may be another file's.
  int get() const noexcept { return descriptor_; }
  explicit operator bool() const noexcept { return descriptor_ >= 0; }
  // Whoever calls closes it from now on.
  [[nodiscard]] int release() noexcept { return std::exchange(descriptor_, -1); }
  // Closes it now; nothing when there is none.
  void reset() noexcept {
    if (descriptor_ >= 0) {
      ::close(std::exchange(descriptor_, -1));
    }
  }

 private:
  int descriptor_ = -1;
};

}  // namespace tarn::linux_host
