// SPDX-License-Identifier: Apache-2.0
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
// So many users are remembered before those that are gone are looked for.
constexpr std::size_t kKeptUsers = 64;
constexpr platform::OverflowStore::Bounds kNoBounds;

}  // namespace

TarnReportingSessionLogMemory::TarnReportingSessionLogMemory()
    : store_(TarnReportingFacilities().overflow),
      bounds_(store_ != nullptr ? store_->bounds() : kNoBounds),
      nobodys_(std::make_unique<Share>()) {}

TarnReportingSessionLogMemory::~TarnReportingSessionLogMemory() = default;

std::shared_ptr<TarnReportingSessionLogAccount> TarnReportingSessionLogMemory::makeAccount(std::uint32_t user) {
  if (shares_.size() > kKeptUsers) {
    std::erase_if(shares_, [](const auto& entry) { return entry.second.expired(); });
  }
  std::weak_ptr<Share>& known = shares_[user];
  std::shared_ptr<Share> share = known.lock();
  if (share == nullptr) {
    share = std::make_shared<Share>();
    known = share;
  }
  return std::make_shared<TarnReportingSessionLogAccount>(TarnReportingSessionLogAccount{0, std::move(share)});
}

std::size_t TarnReportingSessionLogMemory::chunkBytes() const noexcept {
  return std::min(kLargestChunk, bounds_.bytesOfSession / kChunksOfBound);
}

TarnReportingSessionLogMemory::Share& TarnReportingSessionLogMemory::shareOf(const List& list) noexcept {
  return list.account_ && list.account_->share ? *list.account_->share : *nobodys_;
}

TarnReportingSessionLogMemory::Usage TarnReportingSessionLogMemory::usage() const noexcept {
  return {bytesInMemory(), pageCounts_->bytesInStore, overflowing_, failures_, pageCounts_->recordsLost};
}

std::size_t TarnReportingSessionLogMemory::costOf(const TarnReportingSessionMessage& record) noexcept {
  const plist::Dictionary& payload = record.message();
  std::size_t cost = kRecordBytes + kBlockBytes + payload.storageBytes();
  const std::uint64_t shape = payload.keysHash();
  std::uint64_t& known = knownShapes_[shape % kKnownShapes];
  if (known != shape) {
    known = shape;
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
  shareOf(list).bytes += bytes;
  if (list.account_) {
    list.account_->bytes += bytes;
  }
  place(list);
}

void TarnReportingSessionLogMemory::subtract(List& list, std::size_t bytes) noexcept {
  bytes_ -= bytes;
  list.bytes_ -= bytes;
  shareOf(list).bytes -= bytes;
  if (list.account_) {
    list.account_->bytes -= bytes;
  }
  if (retryAt_) {
    retryAt_ = std::min(*retryAt_, bytesInMemory() + kRetryBytes);
  }
  place(list);
}

void TarnReportingSessionLogMemory::relieve(List& list) {
  try {
    while (list.bytes_ > bounds_.bytesOfSession && mayTry() && list.moveOldest()) {
    }
    Share& share = shareOf(list);
    while (&share != nobodys_.get() && share.bytes > bounds_.bytesOfUser && relieveLargest(share)) {
    }
    while (bytesInMemory() > bounds_.bytesInAll && relieveLargest()) {
    }
  } catch (const std::bad_alloc&) {
    toldFailure(Error{.text = "out of memory"});  // the message is in its log, and that is what counts
  }
}

// Lists in the way that can't give anything now are those that are gone through.
bool TarnReportingSessionLogMemory::relieveLargest(Share& share) {
  for (auto row = share.rows.rbegin(); row != share.rows.rend(); ++row) {
    for (List* list = *row; list != nullptr && mayTry(); list = list->link_.next) {
      if (list->moveOldest()) return true;
    }
  }
  return false;
}

// Who has most may have nothing that can be moved.
bool TarnReportingSessionLogMemory::relieveLargest() {
  Share* largest = nobodys_.get();
  for (const auto& [user, known] : shares_) {
    if (const auto share = known.lock(); share && share->bytes > largest->bytes) {
      largest = share.get();
    }
  }
  return relieveLargest(*largest) || relieveLargest(*nobodys_) ||
         std::any_of(shares_.begin(), shares_.end(), [this](const auto& entry) {
           const auto share = entry.second.lock();
           return share && relieveLargest(*share);
         });
}

void TarnReportingSessionLogMemory::toldFailure(const Error& error) {
  ++failures_;
  if (!std::exchange(retryAt_, bytesInMemory() + kRetryBytes)) {
    kLog(LogLevel::Error, "no room for messages beyond the bound of the logs, they stay in memory: %@", error.text);
  }
}

void TarnReportingSessionLogMemory::toldSuccess() {
  if (std::exchange(retryAt_, std::nullopt)) {
    kLog(LogLevel::Default, "there is room again for messages beyond the bound of the logs");
  }
}

void TarnReportingSessionLogMemory::leave(List& list) noexcept {
  shareOf(list).bytes -= list.bytes_;
  placeIn(list, nullptr);
}

void TarnReportingSessionLogMemory::enter(List& list) noexcept {
  shareOf(list).bytes += list.bytes_;
  place(list);
}

TarnReportingSessionLogMemory::List** TarnReportingSessionLogMemory::rowOf(const List& list) noexcept {
  const bool isEmpty = list.size() == list.overflowed();
  return isEmpty ? nullptr : &shareOf(list).rows[static_cast<std::size_t>(std::bit_width(list.bytes_))];
}

void TarnReportingSessionLogMemory::placeIn(List& list, List** row) noexcept {
  Link& link = list.link_;
  if (row != link.row) {
    if (link.row != nullptr) {
      point(link.at, link.next);
    }
    link.row = row;
    if (row != nullptr) {
      point(&link.next, *row);
      point(row, &list);
    }
  }
}

void TarnReportingSessionLogMemory::point(List** at, List* list) noexcept {
  *at = list;
  if (list != nullptr) {
    list->link_.at = at;
  }
}

}  // namespace tarn
