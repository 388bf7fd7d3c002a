#include "session/TarnReportingSessionLogMemory.h"

#include <algorithm>
#include <bit>
#include <new>
#include <utility>

#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSessionMessageList.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSessionLogMemory"};

constexpr std::size_t kLargestChunk = std::size_t{128} << 10U;
constexpr std::size_t kChunksOfBound = 8;
constexpr std::size_t kRetryBytes = std::size_t{1} << 20U;
// A record with its count and the allocator's share, its place in the list, and the share of a payload's block.
constexpr std::size_t kRecordBytes = 64;
constexpr std::size_t kBlockBytes = 16;
constexpr std::size_t kKeyBytes = 56;

// Of a list of this size; -1 for an empty one.
int rowOf(std::size_t bytes) noexcept {
  return static_cast<int>(std::bit_width(bytes)) - 1;
}

}  // namespace

TarnReportingSessionLogMemory::TarnReportingSessionLogMemory()
    : store_(TarnReportingFacilities().overflow),
      bounds_(store_ != nullptr ? store_->bounds() : platform::OverflowStore::Bounds{}),
      chunkBytes_(std::min(kLargestChunk, bounds_.bytesOfSession / kChunksOfBound)) {}

TarnReportingSessionLogMemory::Usage TarnReportingSessionLogMemory::usage() const noexcept {
  return {bytesInMemory(), pageCounts_->bytesInStore, overflowing_, failures_, pageCounts_->recordsLost};
}

std::size_t TarnReportingSessionLogMemory::costOf(const TarnReportingSessionMessage& record) noexcept {
  const plist::Dictionary& payload = record.message();
  std::size_t cost = kRecordBytes + kBlockBytes + payload.storageBytes();
  std::uint64_t& known = knownShapes_[payload.keysHash() % kKnownShapes];
  if (known != payload.keysHash()) {
    known = payload.keysHash();
    const plist::KeyList keys = payload.keys();
    for (std::size_t index = 0; index < keys.size(); ++index) {
      cost += kKeyBytes + keys[index].text().size();
    }
  }
  return cost;
}

void TarnReportingSessionLogMemory::add(List& list, std::size_t bytes) {
  bytes_ += bytes;
  list.bytes_ += bytes;
  if (list.account_) {
    list.account_->bytes += bytes;
  }
  if (rowOf(list.bytes_) != list.link_.row) {
    place(list);
  }
}

void TarnReportingSessionLogMemory::subtract(List& list, std::size_t bytes) noexcept {
  bytes_ -= bytes;
  list.bytes_ -= bytes;
  if (list.account_) {
    list.account_->bytes -= bytes;
  }
  if (failing_) {
    retryAt_ = std::min(retryAt_, bytesInMemory() + kRetryBytes);
  }
  place(list);
}

void TarnReportingSessionLogMemory::relieve(List& list) {
  if (list.bytes_ <= bounds_.bytesOfSession && bytesInMemory() <= bounds_.bytesInAll) return;
  try {
    while (list.bytes_ > bounds_.bytesOfSession && mayTry() && list.moveOldest()) {
    }
    while (bytesInMemory() > bounds_.bytesInAll && mayTry() && relieveLargest()) {
    }
  } catch (const std::bad_alloc&) {
    toldFailure(Error{0, "out of memory"});  // the message is in its log, and that is what counts
  }
}

// Lists in the way that can't give anything now are those that are gone through.
bool TarnReportingSessionLogMemory::relieveLargest() {
  for (auto row = rows_.rbegin(); row != rows_.rend(); ++row) {
    for (List* list = *row; list != nullptr; list = list->link_.next) {
      if (list->moveOldest()) return true;
      if (!mayTry()) return false;
    }
  }
  return false;
}

void TarnReportingSessionLogMemory::toldFailure(const Error& error) {
  ++failures_;
  retryAt_ = bytesInMemory() + kRetryBytes;
  if (std::exchange(failing_, true)) return;
  kLog(LogLevel::Error, "no room for messages beyond the bound of the logs, they stay in memory: %@", error.text);
}

void TarnReportingSessionLogMemory::toldSuccess() {
  retryAt_ = 0;
  if (std::exchange(failing_, false)) {
    kLog(LogLevel::Default, "there is room again for messages beyond the bound of the logs");
  }
}

void TarnReportingSessionLogMemory::place(List& list) noexcept {
  const int row = rowOf(list.bytes_);
  if (row == list.link_.row) return;
  unplace(list);
  if (row < 0) return;
  List*& first = rows_[static_cast<std::size_t>(row)];
  list.link_ = {nullptr, first, row};
  if (first != nullptr) {
    first->link_.previous = &list;
  }
  first = &list;
}

void TarnReportingSessionLogMemory::unplace(List& list) noexcept {
  const Link link = list.link_;
  if (link.row < 0) return;
  if (link.previous != nullptr) {
    link.previous->link_.next = link.next;
  } else {
    rows_[static_cast<std::size_t>(link.row)] = link.next;
  }
  if (link.next != nullptr) {
    link.next->link_.previous = link.previous;
  }
  list.link_ = {};
}

}  // namespace tarn
