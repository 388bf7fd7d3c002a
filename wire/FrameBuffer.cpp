// SPDX-License-Identifier: Apache-2.0
#include "wire/FrameBuffer.h"

#include <algorithm>
#include <cstring>

namespace tarn::wire {

namespace {

std::size_t lengthAt(const std::byte* at) noexcept {
  return std::to_integer<std::size_t>(at[0]) | std::to_integer<std::size_t>(at[1]) << 8U |
         std::to_integer<std::size_t>(at[2]) << 16U | std::to_integer<std::size_t>(at[3]) << 24U;
}

}  // namespace

std::span<std::byte> FrameBuffer::space() {
  const std::size_t pending = pendingBytes();
  std::size_t wanted = kGulpBytes;
  while (wanted < pending + kGulpBytes / 2) {
    wanted *= 2;
  }
  wanted = std::min(wanted, maxFrameBytes_ + kGulpBytes);
  // A little too large is kept: a stream of middling frames shouldn't make and drop memory for each.
  if (wanted > capacity_ || wanted * 4 <= capacity_) {
    resize(wanted);
  } else if (pending == 0 || capacity_ - end_ < kGulpBytes / 2) {
    moveToFront();
  }
  return {bytes_.get() + end_, capacity_ - end_};
}

FrameBuffer::Next FrameBuffer::next(std::span<const std::byte>& frame) noexcept {
  const std::size_t pending = pendingBytes();
  if (pending < kFrameHeaderBytes) return Next::Incomplete;
  const std::size_t length = lengthAt(bytes_.get() + begin_);
  if (length > maxFrameBytes_) return Next::Oversize;
  if (pending - kFrameHeaderBytes < length) return Next::Incomplete;
  frame = {bytes_.get() + begin_ + kFrameHeaderBytes, length};
  begin_ += kFrameHeaderBytes + length;
  return Next::Frame;
}

std::size_t FrameBuffer::announcedBytes() const noexcept {
  return pendingBytes() < kFrameHeaderBytes ? 0 : lengthAt(bytes_.get() + begin_);
}

void FrameBuffer::release() noexcept {
  if (pendingBytes() == 0) {
    bytes_.reset();
    capacity_ = begin_ = end_ = 0;
  }
}

void FrameBuffer::moveToFront() noexcept {
  const std::size_t pending = pendingBytes();
  if (begin_ != 0 && pending != 0) {
    std::memmove(bytes_.get(), bytes_.get() + begin_, pending);
  }
  begin_ = 0;
  end_ = pending;
}

void FrameBuffer::resize(std::size_t capacity) {
  moveToFront();
  void* const bytes = plist::detail::allocate(capacity, bytes_.get());
  static_cast<void>(bytes_.release());
  bytes_.reset(static_cast<std::byte*>(bytes));
  capacity_ = capacity;
}

}  // namespace tarn::wire
