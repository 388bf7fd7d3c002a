// SPDX-License-Identifier: Apache-2.0
// FrameBuffer: cuts a received byte stream into frames without copying them.
//
// Which problem: frames come in pieces or many at a time, and a peer may announce a large one and never send it. How:
// the owner receives in large gulps straight into the buffer's free space and takes whole frames where they lie.
//
//   [taken frames][length 4][frame ...][length 4][part of a frame][free space]
//                 ^ begin                                        ^ end
//
// Owned by one connection. Its memory grows only as bytes really arrive, is never more than the largest frame and a
// gulp, and is given back once a large frame is gone. Threads: one at a time.
//
// Usage: receive into space(), say how much with received(), call next() until it doesn't yield a frame, and again.
#pragma once

#include <cstddef>
#include <memory>
#include <span>

#include "plist/Allocation.h"
#include "wire/Operation.h"

namespace tarn::wire {

// A frame that is announced too long is found out by its first four bytes; content isn't looked at. Receiving into it
// costs no copy but that of what is left of a frame when the space runs out. Throws std::bad_alloc in space() alone.
class FrameBuffer {
 public:
  // The free space that is offered when no large frame is under way.
  static constexpr std::size_t kGulpBytes = 65536;

  enum class Next {
    Frame,       // the frame is there
    Incomplete,  // more bytes are needed
    Oversize,    // the next frame is announced longer than allowed; nothing can be read any more
  };

  explicit FrameBuffer(std::size_t maxFrameBytes = kDefaultMaxFrameBytes) noexcept : maxFrameBytes_(maxFrameBytes) {}
  FrameBuffer(const FrameBuffer&) = delete;
  FrameBuffer& operator=(const FrameBuffer&) = delete;

  // Where to receive. Never empty once next() has said Incomplete. Frames handed out before become invalid.
  std::span<std::byte> space();
  // So many bytes were received into the space.
  void received(std::size_t bytes) noexcept { end_ += bytes; }

  // The next whole frame, its length left out. Valid until space() or release() is called.
  Next next(std::span<const std::byte>& frame) noexcept;

  // As it was made with.
  std::size_t maxFrameBytes() const noexcept { return maxFrameBytes_; }
  // Received bytes that no frame was made of yet: part of one, or frames that nobody has asked for.
  std::size_t pendingBytes() const noexcept { return end_ - begin_; }
  // The length that the unfinished or refused frame announces; 0 while that is not known.
  std::size_t announcedBytes() const noexcept;
  // Gives the memory back when no bytes are pending; for connections that have gone quiet.
  void release() noexcept;

 private:
  void moveToFront() noexcept;
  // Moves what is pending to the front, and has the memory grow or shrink to this size: large memory does so in its
  // place, by pages, so that what lies in it isn't copied.
  void resize(std::size_t capacity);

  // Above this a frame is Oversize.
  std::size_t maxFrameBytes_;
  std::unique_ptr<std::byte, plist::detail::Release> bytes_;
  // Of bytes_; what is pending lies from begin_ to end_.
  std::size_t capacity_ = 0;
  std::size_t begin_ = 0;
  std::size_t end_ = 0;
};

}  // namespace tarn::wire
