// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionLogMemory: how much memory all message lists of the process take, and who gives some back when
// that is too much.
//
// A list that outgrows the bound of a session moves its own oldest messages to the overflow store. When all together
// outgrow theirs, the largest list does, or one at least half as large: lists stand in rows by the power of two of
// their size, so that finding it costs the same with one list and with a hundred thousand. It frees most at once, and
// it is the one whose client made the others pay.
//
// The lists of one user's sessions have a bound of their own, and rows of their own: it is the user's largest list that
// gives way then, and when all together are too large, it is that of the user who has most. So nobody's memory is taken
// by who opens many sessions.
//
// A store that can't take anything (none is there, its disk is full) loses nothing: messages stay in memory, one line
// tells so, and it is tried again after every further mebibyte.
//
// Owner: ProcessState. Threads: the server queue.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <unordered_map>

#include "platform/OverflowStore.h"
#include "plist/Dictionary.h"
#include "session/TarnReportingSessionMessagePage.h"

namespace tarn {

class TarnReportingSessionMessageList;
struct TarnReportingSessionLogShare;

// The memory that the logs of one owner's sessions take. Bytes as costOf() estimates them. The owner reads it to hold a
// client to its quota.
struct TarnReportingSessionLogAccount {
  std::size_t bytes = 0;
  // Of the user whose client the owner is; null: of those that are nobody's.
  std::shared_ptr<TarnReportingSessionLogShare> share{};
};

class TarnReportingSessionLogMemory {
 public:
  // What `status` shows of it.
  struct Usage {
    std::size_t bytes = 0;          // in memory
    std::size_t overflowBytes = 0;  // in the store
    std::size_t overflowing = 0;    // lists that have messages there
    std::uint64_t failures = 0;     // times that the store took nothing
    std::uint64_t lost = 0;         // messages that couldn't be read back

    bool operator==(const Usage&) const = default;
  };

  // Takes the store from the facilities, and its bounds as they are at each look; without a store nothing is ever
  // moved.
  TarnReportingSessionLogMemory();
  ~TarnReportingSessionLogMemory();
  TarnReportingSessionLogMemory(const TarnReportingSessionLogMemory&) = delete;
  TarnReportingSessionLogMemory& operator=(const TarnReportingSessionLogMemory&) = delete;

  // At this moment; failures and losses since the process began.
  Usage usage() const noexcept;
  // An account for lists of this user's sessions. Users are remembered while they have one.
  std::shared_ptr<TarnReportingSessionLogAccount> makeAccount(std::uint32_t user);

 private:
  friend class TarnReportingSessionMessageList;
  using List = TarnReportingSessionMessageList;
  using Page = TarnReportingSessionMessagePage;
  using Share = TarnReportingSessionLogShare;
  friend struct TarnReportingSessionLogShare;

  // A place in a row of lists of about the same size.
  struct Link {
    List** row = nullptr;  // null: in none
    List** at = nullptr;   // what points to the list: the row, or the link of the list before
    List* next = nullptr;
  };
  // One for each power of two that a size may have.
  static constexpr std::size_t kRows = std::numeric_limits<std::size_t>::digits + 1;
  // As many shapes as a connection may declare; a slot holds one, and two that share a slot pay for their keys in
  // turns.
  static constexpr std::size_t kKnownShapes = 1024;

  // What a record takes, its share of keys included.
  std::size_t costOf(const TarnReportingSessionMessage& record) noexcept;
  // Books them with the process, the list and its owner's account, and moves the list to another row when it is time.
  void add(List& list, std::size_t bytes);
  // The opposite. While the store fails it also brings the next attempt nearer, as there is less in memory.
  void subtract(List& list, std::size_t bytes) noexcept;
  // Moves messages to the store until both bounds are kept again, or it takes no more.
  void relieve(List& list);
  // Moves a chunk of the largest list that can give one, of a user or of whoever has most; false when none can or the
  // store failed.
  bool relieveLargest(Share& share);
  bool relieveLargest();
  Share& shareOf(const List& list) noexcept;
  // That are moved at once: 128 KiB, or an eighth of a session's bound when that is less. Large enough that a page is
  // worth a write, small enough that two opened pages are no burden.
  std::size_t chunkBytes() const noexcept;
  // Pages count that the store had no room for.
  std::size_t bytesInMemory() const noexcept { return bytes_ + pageCounts_->bytesInMemory; }
  // After a failure not before memory has grown by a further mebibyte, or a full disk would be asked for every message.
  bool mayTry() const noexcept { return store_ != nullptr && (!retryAt_ || bytesInMemory() >= *retryAt_); }
  // An error line for the first of failures in a row, and one more line when the store takes messages again.
  void toldFailure(const Error& error);
  // From then on it is tried again whenever a bound is exceeded.
  void toldSuccess();
  // Puts the list into the row of its size; an empty one into none.
  void place(List& list) noexcept { placeIn(list, rowOf(list)); }
  // For a list whose account changes: out of what its user has, and into what the new one has.
  void leave(List& list) noexcept;
  void enter(List& list) noexcept;
  List** rowOf(const List& list) noexcept;
  static void placeIn(List& list, List** row) noexcept;
  static void point(List** at, List* list) noexcept;

  platform::OverflowStore* const store_;
  const platform::OverflowStore::Bounds& bounds_;  // the store's own
  std::size_t bytes_ = 0;
  std::size_t overflowing_ = 0;
  std::uint64_t failures_ = 0;
  // The last attempt failed; the memory in bytes at which the next one is made.
  std::optional<std::size_t> retryAt_;
  const std::shared_ptr<Page::Counts> pageCounts_ = std::make_shared<Page::Counts>();
  std::unordered_map<std::uint32_t, std::weak_ptr<Share>> shares_;
  // Key lists are shared by all messages of a shape: who brings one that wasn't seen lately pays for it.
  std::array<std::uint64_t, kKnownShapes> knownShapes_{};
  const std::unique_ptr<Share> nobodys_;
};

// What the lists of one user's sessions take, and where they stand. Lives as long as an account of the user.
struct TarnReportingSessionLogShare {
  std::size_t bytes = 0;
  // The first list of each row; lists link themselves.
  std::array<TarnReportingSessionMessageList*, TarnReportingSessionLogMemory::kRows> rows{};
};

}  // namespace tarn
