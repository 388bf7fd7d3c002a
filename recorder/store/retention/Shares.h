// SPDX-License-Identifier: Apache-2.0
// Shares: what each user's events take of the recorder's file, and whose go next.
//
// Which problem: with the oldest going first, whoever sends most pushes everybody else's history out. How: the events
// that go are always those of the user who has most, the oldest message first and summaries only when no message is
// left. So nobody who has less than the cap divided by the users loses anything, what some don't use is lent to those
// who have more, and it is taken back from them as it is needed.
//
// Of two who have the same the lower number comes first, the service itself before everybody.
//
// Owner: the retention. Threads: the writer's. All of it is memory: what a rollback takes back is taken back here too.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <utility>

#include "recorder/store/retention/EventOwner.h"

namespace tarn::recorder {

class Shares {
 public:
  struct Account {
    std::int64_t bytes = 0;
    // By sort: how many there are, and an id below which there are none.
    std::array<std::int64_t, 2> events{};
    std::array<std::int64_t, 2> from{};
  };

  void add(Owner owner, EventSort sort, std::int64_t id, std::int64_t bytes);
  // One that was added. Whoever has no event left is forgotten.
  void remove(Owner owner, EventSort sort, std::int64_t bytes);
  // Below `id` the owner has no event of the sort any more.
  void passed(Owner owner, EventSort sort, std::int64_t id);

  bool empty() const noexcept { return order_.empty(); }
  // Whose events go next, and of which sort; not when it is empty.
  Owner largest() const noexcept { return order_.begin()->second; }
  EventSort nextSort(Owner owner) const;
  // Of whom something goes next when only what has no greater id than `last` may go: of those who may have such, who
  // has most. Nothing when nobody has.
  struct Next {
    Owner owner;
    EventSort sort;
  };
  std::optional<Next> nextUpTo(std::int64_t last) const;
  // All zero for somebody without events.
  Account of(Owner owner) const;
  std::int64_t events() const noexcept { return events_; }
  std::int64_t bytes() const noexcept { return bytes_; }

  // What was done since the last of these two stays, or is undone.
  void committed() noexcept { before_.clear(); }
  void rolledBack();
  void clear() noexcept;

 private:
  // The account, as it was before kept for a rollback.
  Account& change(Owner owner);
  void place(Owner owner, const Account& account);
  void unplace(Owner owner, const Account& account);

  std::map<Owner, Account> accounts_;
  // Most bytes first.
  std::set<std::pair<std::int64_t, Owner>> order_;
  std::map<Owner, std::optional<Account>> before_;
  std::int64_t events_ = 0;
  std::int64_t bytes_ = 0;
};

}  // namespace tarn::recorder
