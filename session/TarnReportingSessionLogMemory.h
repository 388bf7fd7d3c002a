// TarnReportingSessionLogMemory: how much memory all message lists of the process take, and who gives some back when
// that is too much.
//
// A list that outgrows the bound of a session moves its own oldest messages to the overflow store. When all together
// outgrow theirs, the largest list does, or one at least half as large: lists stand in rows by the power of two of
// their size, so that finding it costs the same with one list and with a hundred thousand. It frees most at once, and
// it is the one whose client made the others pay.
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

#include "platform/OverflowStore.h"
#include "plist/Dictionary.h"
#include "session/TarnReportingSessionMessagePage.h"

namespace tarn {

class TarnReportingSessionMessageList;

// The memory that the logs of one owner's sessions take.
struct TarnReportingSessionLogAccount {
  std::size_t bytes = 0;
};

class TarnReportingSessionLogMemory {
 public:
  struct Usage {
    std::size_t bytes = 0;          // in memory
    std::size_t overflowBytes = 0;  // in the store
    std::size_t overflowing = 0;    // lists that have messages there
    std::uint64_t failures = 0;     // times that the store took nothing
    std::uint64_t lost = 0;         // messages that couldn't be read back

    bool operator==(const Usage&) const = default;
  };

  TarnReportingSessionLogMemory();
  TarnReportingSessionLogMemory(const TarnReportingSessionLogMemory&) = delete;
  TarnReportingSessionLogMemory& operator=(const TarnReportingSessionLogMemory&) = delete;

  Usage usage() const noexcept;

 private:
  friend class TarnReportingSessionMessageList;
  using List = TarnReportingSessionMessageList;
  using Page = TarnReportingSessionMessagePage;

  // A place in a row of lists of about the same size.
  struct Link {
    List** row = nullptr;  // null: in none
    List** at = nullptr;   // what points to the list: the row, or the link of the list before
    List* next = nullptr;
  };
  static constexpr std::size_t kRows = std::numeric_limits<std::size_t>::digits + 1;
  static constexpr std::size_t kKnownShapes = 1024;

  // What a record takes, its share of keys included.
  std::size_t costOf(const TarnReportingSessionMessage& record) noexcept;
  void add(List& list, std::size_t bytes);
  void subtract(List& list, std::size_t bytes) noexcept;
  // Moves messages to the store until both bounds are kept again, or it takes no more.
  void relieve(List& list);
  bool relieveLargest();
  std::size_t bytesInMemory() const noexcept { return bytes_ + pageCounts_->bytesInMemory; }
  bool mayTry() const noexcept { return store_ != nullptr && (!retryAt_ || bytesInMemory() >= *retryAt_); }
  void toldFailure(const Error& error);
  void toldSuccess();
  // Puts the list into the row of its size; an empty one into none.
  void place(List& list) noexcept;
  static void point(List** at, List* list) noexcept;

  platform::OverflowStore* const store_;
  const platform::OverflowStore::Bounds bounds_;
  const std::size_t chunkBytes_;  // that are moved at once
  std::size_t bytes_ = 0;
  std::size_t overflowing_ = 0;
  std::uint64_t failures_ = 0;
  std::optional<std::size_t> retryAt_;  // bytes in memory, after a failure
  const std::shared_ptr<Page::Counts> pageCounts_ = std::make_shared<Page::Counts>();
  std::array<List*, kRows> rows_{};
  // Key lists are shared by all messages of a shape: who brings one that wasn't seen lately pays for it.
  std::array<std::uint64_t, kKnownShapes> knownShapes_{};
};

}  // namespace tarn
