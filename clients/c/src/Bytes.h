// SPDX-License-Identifier: Apache-2.0
// Bytes: a text or a frame that grows. Without the C++ runtime, and so without exceptions: when memory runs out it is
// marked as failed, and what is appended from then on is left out. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

namespace tarn::reporting {

// One growing block of memory and how much of it is used. Each growth doubles it, so appending costs a copy of each
// byte or two in all. Data pointers hold until the next call that appends.
class Bytes {
 public:
  Bytes() = default;
  Bytes(const Bytes&) = delete;
  Bytes& operator=(const Bytes&) = delete;
  ~Bytes() { std::free(data_); }

  // Null as long as nothing was appended.
  std::uint8_t* data() noexcept { return data_; }
  const std::uint8_t* data() const noexcept { return data_; }
  std::size_t size() const noexcept { return size_; }
  // Memory ran out since the last clear(): what is here is only the beginning of what was appended, to be thrown away.
  bool failed() const noexcept { return failed_; }
  // Empties it and keeps the memory for what comes next.
  void clear() noexcept {
    size_ = 0;
    failed_ = false;
  }
  // Empties it and gives the memory back.
  void release() noexcept {
    std::free(data_);
    data_ = nullptr;
    size_ = capacity_ = 0;
    failed_ = false;
  }

  // Nothing is appended of a piece for which there is no memory, and nothing after it.
  void append(const void* bytes, std::size_t count) noexcept {
    if (count != 0 && reserve(count)) {
      std::memcpy(data_ + size_, bytes, count);
      size_ += count;
    }
  }
  // The bytes that the other one has, failed or not; the caller asks failed() of both.
  void append(const Bytes& other) noexcept { append(other.data(), other.size()); }
  // For heads, byte by byte.
  void append(std::uint8_t byte) noexcept { append(&byte, 1); }
  // Drops so many bytes from the front, at most size(); moves what is left.
  void dropFront(std::size_t count) noexcept {
    std::memmove(data_, data_ + count, size_ - count);
    size_ -= count;
  }
  // Room for so many more bytes after the others, for a system call to fill; null when there is no memory. They count
  // once grow() says so, which may be for fewer.
  std::uint8_t* room(std::size_t count) noexcept { return reserve(count) ? data_ + size_ : nullptr; }
  void grow(std::size_t count) noexcept { size_ += count; }
  // Puts bytes in the place of earlier ones, all of which must be there: the length before a frame, known at its end.
  void overwrite(std::size_t at, const void* bytes, std::size_t count) noexcept {
    if (!failed_) {
      std::memcpy(data_ + at, bytes, count);
    }
  }

 private:
  // Whether there is room for so many more bytes now. Doubled from what is needed, so small appends seldom come here.
  bool reserve(std::size_t count) noexcept {
    if (failed_ || capacity_ - size_ >= count) return !failed_;
    const std::size_t wanted = (size_ + count) * 2;
    auto* const moved = static_cast<std::uint8_t*>(std::realloc(data_, wanted));
    if (moved == nullptr) {
      failed_ = true;
      return false;
    }
    data_ = moved;
    capacity_ = wanted;
    return true;
  }

  // Of `capacity_` bytes, `size_` of them used.
  std::uint8_t* data_ = nullptr;
  std::size_t size_ = 0;
  std::size_t capacity_ = 0;
  // From the first refusal of memory on, until clear() or release().
  bool failed_ = false;
};

}  // namespace tarn::reporting
