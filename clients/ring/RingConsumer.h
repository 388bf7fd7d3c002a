// SPDX-License-Identifier: Apache-2.0
// RingConsumer: the reading side of a ring. Copies each record out of the shared memory before anybody looks at it, so
// that what is checked is what is used, and believes nothing that the writer wrote.
//
//   next() -> Record: its content is in the caller's buffer; take() goes on, without it next() gives the same again
//          -> Empty
//          -> Broken: the positions or lengths make no sense; nothing more is to be read from this ring
//
//   position   taken                                       head
//   given back | next record ... published, not looked at  | nothing yet
//
// One owner a ring, which also owns the memory. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>

#include "clients/ring/RingLayout.h"
#include "clients/ring/SharedWords.h"

namespace tarn::ring {

// What next() found: a tarnring_kind that is never a filler, and the bytes of its content without the padding.
struct Record {
  std::uint32_t kind = TARNRING_FILLER;
  std::uint32_t length = 0;
};

// What next() answers; see above.
enum class Look { Record, Empty, Broken };

// The service's end of a ring. `Words` is how the memory is touched: SharedWords, or in tests one that stops at each
// step. Nothing here allocates, waits or makes a system call; next() costs the copy of one record.
template <class Words = SharedWords>
class RingConsumer {
 public:
  // Reads on where the header says that reading ended. `dataBytes` was checked once; the header's is not looked at.
  // The sleeps are numbered from `firstSleep` on: no number that a reader of this ring had before, or its writer would
  // believe that it has woken this one already.
  RingConsumer(tarnring_header* header, std::byte* data, std::uint32_t dataBytes, std::uint64_t firstSleep) noexcept
      : header_(header),
        data_(data),
        dataBytes_(dataBytes),
        taken_(Words::load(&header->taken)),
        takenMessages_(Words::load(&header->taken_messages)),
        refused_(Words::load(&header->refused)),
        head_(taken_),
        sleeps_(firstSleep) {
    awake();
  }

  // Bytes that the buffer of next() must have.
  // A bound that the writer can't move, since the size of the area was checked when the ring was opened.
  std::uint32_t mostContent() const noexcept { return dataBytes_ / TARNRING_RECORD_SHARE - TARNRING_RECORD_HEAD_BYTES; }

  // Copies the content of the next record to `buffer` and tells its kind and length; on anything but Look::Record
  // `buffer` and `record` mean nothing. Once Broken it stays so. Fillers are looked past.
  Look next(std::byte* buffer, Record& record) noexcept {
    if (broken_ || (taken_ == head_ && !lookForMore())) return broken_ ? Look::Broken : Look::Empty;
    std::uint64_t word = 0;
    Words::copyOut(&word, byteAt(taken_), sizeof word);
    record.kind = static_cast<std::uint32_t>(word >> 32U);
    record.length = static_cast<std::uint32_t>(word);
    if (!isWhole(record)) {
      broken_ = true;
      return Look::Broken;
    }
    size_ = TARNRING_RECORD_HEAD_BYTES + tarnring_padded(record.length);
    if (record.kind != TARNRING_FILLER) {
      Words::copyOut(buffer, byteAt(taken_) + TARNRING_RECORD_HEAD_BYTES, record.length);
      return Look::Record;
    }
    stepOver(record);
    return next(buffer, record);  // once: a filler ends where the area ends, and one there is nothing but its head
  }

  // Steps over the record that next() gave last; `record` must be that one. The writer may use its room from then on,
  // and a later reader of the ring begins after it. Told record by record: the writer looks here only when it has no
  // room left, so the line stays ours.
  void take(const Record& record) noexcept {
    stepOver(record);
    Words::store(&header_->taken_messages, takenMessages_);
    Words::storeRelease(&header_->taken, taken_);
  }
  // Tells the writer that what came of everything before `position` is on the disk, and how many messages that is.
  void publishCommitted(std::uint64_t position, std::uint64_t messages) noexcept {
    Words::store(&header_->committed_messages, messages);
    Words::storeRelease(&header_->committed, position);
  }
  // Counts a record that was refused; it is taken like any other.
  void refuse(tarnring_refusal reason) noexcept {
    Words::store(&header_->last_refusal, reason);
    Words::store(&header_->refused, ++refused_);
  }

  // Announces a sleep, from which the writer wakes its reader. False when there is something to read: then nothing is
  // announced.
  // The fence keeps the store of `asleep` before the load of `head`, as the writer's keeps its store of `head` before
  // its load of `asleep`: whatever the order, one of both sees the other.
  bool prepareToSleep() noexcept {
    Words::store(&header_->asleep, sleeps_++);
    Words::fence();
    if (Words::loadAcquire(&header_->head) == taken_) return true;
    awake();
    return false;
  }
  // Tells the writer that nobody need be woken; to be called after each sleep.
  void awake() noexcept { Words::store(&header_->asleep, 0); }

  // Position and number of messages up to which records were taken.
  std::uint64_t taken() const noexcept { return taken_; }
  std::uint64_t takenMessages() const noexcept { return takenMessages_; }
  // As the writer tells them, which may be wrong: up to where it published, and how many records found no room.
  std::uint64_t head() const noexcept { return Words::loadAcquire(&header_->head); }
  std::uint64_t dropped() const noexcept { return Words::load(&header_->dropped); }
  // Whether the writer said that nothing more comes. What it published before may still wait to be read.
  bool ended() const noexcept { return Words::loadAcquire(&header_->ended) != 0; }

 private:
  // Where a position lies in the area, whose size is a power of two.
  std::byte* byteAt(std::uint64_t position) const noexcept { return data_ + (position & (dataBytes_ - 1)); }

  void stepOver(const Record& record) noexcept {
    taken_ += size_;
    if (record.kind == TARNRING_MESSAGE || record.kind == TARNRING_FRAME) {
      ++takenMessages_;
    }
  }

  // Reads how far the writer has come, when all that was known of is read. A head behind `taken_`, further ahead than
  // the area is long, or off the grid of 8 makes the ring Broken.
  bool lookForMore() noexcept {
    const std::uint64_t head = Words::loadAcquire(&header_->head);
    if (head - taken_ > dataBytes_ || head % 8 != 0 || taken_ % 8 != 0) {
      broken_ = true;
      return false;
    }
    head_ = head;
    return head_ != taken_;
  }

  // Whether the record lies within what is published, in one piece and within its bounds; of a filler, that it ends
  // exactly with the area and that something follows it.
  bool isWhole(const Record& record) const noexcept {
    const std::uint64_t published = head_ - taken_;
    const std::uint64_t upToEnd = dataBytes_ - (taken_ & (dataBytes_ - 1));
    if (record.kind == TARNRING_FILLER) {
      return record.length == upToEnd - TARNRING_RECORD_HEAD_BYTES && upToEnd < published;
    }
    if (record.kind < TARNRING_FILLER || record.kind > TARNRING_GAP || record.length > mostContent()) return false;
    const std::uint64_t size = TARNRING_RECORD_HEAD_BYTES + tarnring_padded(record.length);
    return size <= published && size <= upToEnd;
  }

  // The mapped memory, which the owner keeps mapped.
  tarnring_header* header_;
  std::byte* data_;
  // Of the data area; a power of two, so that a mask makes an offset of a position.
  std::uint32_t dataBytes_;
  // Our own copies of the numbers that we write, read from the header once: what the writer makes of them there later
  // means nothing.
  std::uint64_t taken_;
  std::uint64_t takenMessages_;
  std::uint64_t refused_;
  std::uint64_t head_;  // as it was last seen
  std::uint64_t sleeps_;
  std::uint32_t size_ = 0;  // of the record that next() gave
  bool broken_ = false;
};

}  // namespace tarn::ring
