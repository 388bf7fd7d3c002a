// SPDX-License-Identifier: Apache-2.0
// RingProducer: the writing side of a ring. Puts records into the shared memory and publishes them by one store, so
// that a thread that stops or dies in the middle has published nothing.
//
//   position   taken              head                                        taken + data bytes
//              | not read yet ... | [gap] [filler] record, being written ...  | room that is left
//
// What is dropped is told where it is missing: a gap record stands before the next one that fits. Where the record
// would go around the end of the area, a filler takes the rest of it.
//
// Keeps its positions to itself and believes nothing that the reader writes: a wrong `taken` makes the ring look full,
// never larger. It allocates nothing, waits for nothing and makes no system call; whoever posts asks mustWake() then.
//
// One owner a ring, which also owns the memory. Threads: one at a time, always the same between two publications.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "clients/ring/RingLayout.h"
#include "clients/ring/SharedWords.h"

namespace tarn::ring {

// What a gap record takes in the ring; a multiple of 8 as it is.
inline constexpr std::uint32_t kGapSize = TARNRING_RECORD_HEAD_BYTES + sizeof(tarnring_gap);

// Where the content of a record goes: a cursor in the ring, given to whoever fills a record. What is put must be just
// as long as the record was said to be, padding included; nothing here checks that. Everything lies at multiples of 8.
template <class Words>
class RecordContent {
 public:
  explicit RecordContent(std::byte* at) noexcept : at_(at) {}

  // Eight bytes, in this machine's order, which the layout takes for little-endian.
  void put(std::uint64_t word) noexcept {
    Words::copyIn(at_, &word, sizeof word);
    at_ += sizeof word;
  }
  // The bytes, and zeros up to the next multiple of 8. Most texts are short: those are copied word by word here.
  void put(const void* bytes, std::uint32_t count) noexcept {
    const auto* from = static_cast<const std::byte*>(bytes);
    std::byte* const end = at_ + tarnring_padded(count);
    if (count < 8) {
      putShort(from, count);
    } else if (count > kMostWordwise) {
      putZeros(end - 8);
      Words::copyIn(at_, from, count);
    } else {
      putZeros(end - 8);
      for (std::uint32_t done = 0; done + 8 <= count; done += 8) {
        Words::copyIn(at_ + done, from + done, 8);
      }
      // What is left, with some that stand there already.
      Words::copyIn(at_ + count - 8, from + count - 8, 8);
    }
    at_ = end;
  }

 private:
  static constexpr std::uint32_t kMostWordwise = 128;

  static void putZeros(std::byte* at) noexcept {
    const std::uint64_t zeros = 0;
    Words::copyIn(at, &zeros, sizeof zeros);
  }
  void putShort(const std::byte* from, std::uint32_t count) noexcept {
    if (count == 0) return;
    std::uint64_t word = 0;
    auto* to = reinterpret_cast<std::byte*>(&word);
    for (std::uint32_t part = 4; part != 0; part /= 2) {
      if ((count & part) == 0) continue;
      std::memcpy(to, from, part);
      to += part;
      from += part;
    }
    Words::copyIn(at_, &word, sizeof word);
  }

  std::byte* at_;
};

// The client's end of a ring, inside a posting thread. `Words` is how the memory is touched: SharedWords, or in tests
// one that stops at each step. A post costs the copy of the content and two stores to our line of the header; `taken`,
// which lies in the reader's, is loaded only when the copy of it says that there is no room.
template <class Words = SharedWords>
class RingProducer {
 public:
  // Without a ring; to be assigned to before anything is posted.
  RingProducer() = default;
  // The memory is zero but for what never changes in the header.
  RingProducer(tarnring_header* header, std::byte* data, std::uint32_t dataBytes) noexcept
      : header_(header), data_(data), dataBytes_(dataBytes) {}

  // The longest content that a record may have, in bytes: a record takes a quarter of the area at most.
  std::uint32_t mostContent() const noexcept { return dataBytes_ / TARNRING_RECORD_SHARE - TARNRING_RECORD_HEAD_BYTES; }

  // Publishes a record with a content of `length` bytes (at most mostContent()) that `fill(content)` puts. False when
  // there is no room: then it is counted as dropped, `fill` isn't called, and the next record that fits is preceded by
  // a gap record that tells what was dropped. Gap, filler and record are published together or not at all.
  template <class Fill>
  bool post(tarnring_kind kind, std::uint32_t length, Fill fill) noexcept {
    const std::uint32_t size = TARNRING_RECORD_HEAD_BYTES + tarnring_padded(length);
    const std::uint64_t gapAt = droppedSinceGap_ != 0 ? placeFor(head_, kGapSize) : head_;
    const std::uint64_t gapEnd = droppedSinceGap_ != 0 ? gapAt + kGapSize : head_;
    const std::uint64_t at = placeFor(gapEnd, size);
    if (!hasRoomUpTo(at + size)) {
      drop(size);
      return false;
    }
    if (droppedSinceGap_ != 0) {
      putGap(gapAt);
    }
    putFiller(gapEnd, at);
    putHead(at, kind, length);
    RecordContent<Words> content(byteAt(at) + TARNRING_RECORD_HEAD_BYTES);
    fill(content);
    publish(at + size);
    return true;
  }

  // Whether the reader sleeps and wasn't woken from this sleep yet; the caller wakes it. Asked after each post(). The
  // fence keeps the store of `head` before the load of `asleep`, as the reader's keeps its store of `asleep` before its
  // load of `head`: whatever the order, one of both sees the other. Each sleep has another number, so one wake-up is
  // enough for all that is posted until the reader runs.
  bool mustWake() noexcept {
    Words::fence();
    const std::uint64_t sleep = Words::load(&header_->asleep);
    if (sleep == 0 || sleep == lastWoken_) return false;
    lastWoken_ = sleep;
    return true;
  }

  // Position after the last record that was published.
  std::uint64_t head() const noexcept { return head_; }

 private:
  // Where a position lies in the area, whose size is a power of two.
  std::byte* byteAt(std::uint64_t position) noexcept { return data_ + (position & (dataBytes_ - 1)); }

  // The first position from `position` on where so many bytes lie in one piece.
  std::uint64_t placeFor(std::uint64_t position, std::uint32_t size) const noexcept {
    const std::uint64_t left = dataBytes_ - (position & (dataBytes_ - 1));
    return size <= left ? position : position + left;
  }

  // Whether everything up to `end` may be written over. Looks at the reader's position only when the last one that was
  // seen doesn't do; a `taken` that lies ahead of us wraps around to a huge distance, so it makes the ring look full.
  bool hasRoomUpTo(std::uint64_t end) noexcept {
    if (end - taken_ > dataBytes_) {
      taken_ = Words::loadAcquire(&header_->taken);
    }
    return end - taken_ <= dataBytes_;
  }

  // Counts a record of `size` bytes with its head, for the header and for the next gap.
  void drop(std::uint32_t size) noexcept {
    ++droppedSinceGap_;
    droppedBytesSinceGap_ += size;
    Words::store(&header_->dropped, ++dropped_);
    Words::store(&header_->dropped_bytes, droppedBytes_ += size);
  }

  // The eight bytes before a record's content.
  void putHead(std::uint64_t at, tarnring_kind kind, std::uint32_t length) noexcept {
    const std::uint64_t word = static_cast<std::uint64_t>(kind) << 32U | length;
    Words::copyIn(byteAt(at), &word, sizeof word);
  }

  // Fills from one position to the other, which is the end of the area, where a record didn't fit; nothing when they
  // are the same.
  void putFiller(std::uint64_t from, std::uint64_t to) noexcept {
    if (from != to) {
      putHead(from, TARNRING_FILLER, static_cast<std::uint32_t>(to - from) - TARNRING_RECORD_HEAD_BYTES);
    }
  }

  // A gap record for what was dropped since the last one. It may itself need a filler before it.
  void putGap(std::uint64_t at) noexcept {
    putFiller(head_, at);
    putHead(at, TARNRING_GAP, sizeof(tarnring_gap));
    RecordContent<Words> content(byteAt(at) + TARNRING_RECORD_HEAD_BYTES);
    content.put(droppedSinceGap_);
    content.put(droppedBytesSinceGap_);
    droppedSinceGap_ = 0;
    droppedBytesSinceGap_ = 0;
  }

  // Makes everything before `head` visible to the reader by one store.
  void publish(std::uint64_t head) noexcept {
    head_ = head;
    Words::storeRelease(&header_->head, head);
    // Counted when it is there: a writer that dies in between has posted one more than it says, never one less.
    Words::storeRelease(&header_->posted, ++posted_);
  }

  // Our own copies of the numbers that we write: what the reader makes of them in the header is never read back.
  tarnring_header* header_ = nullptr;
  std::byte* data_ = nullptr;
  std::uint32_t dataBytes_ = 0;
  std::uint64_t head_ = 0;
  std::uint64_t taken_ = 0;  // as it was last seen
  std::uint64_t posted_ = 0;
  std::uint64_t dropped_ = 0;
  std::uint64_t droppedBytes_ = 0;
  // What the next gap record will tell; back to 0 once it is put.
  std::uint64_t droppedSinceGap_ = 0;
  std::uint64_t droppedBytesSinceGap_ = 0;
  // The number of the sleep from which the reader was woken last; 0: never.
  std::uint64_t lastWoken_ = 0;
};

}  // namespace tarn::ring
