// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/Shares.h"

#include <algorithm>

namespace tarn::recorder {

namespace {

constexpr std::size_t indexOf(EventSort sort) noexcept {
  return static_cast<std::size_t>(sort);
}

}  // namespace

void Shares::place(Owner owner, const Account& account) {
  order_.emplace(-account.bytes, owner);
  events_ += account.events[0] + account.events[1];
  bytes_ += account.bytes;
}

void Shares::unplace(Owner owner, const Account& account) {
  order_.erase({-account.bytes, owner});
  events_ -= account.events[0] + account.events[1];
  bytes_ -= account.bytes;
}

Shares::Account& Shares::change(Owner owner) {
  const auto found = accounts_.find(owner);
  before_.try_emplace(owner, found == accounts_.end() ? std::nullopt : std::optional(found->second));
  if (found == accounts_.end()) return accounts_[owner];
  unplace(owner, found->second);
  return found->second;
}

void Shares::add(Owner owner, EventSort sort, std::int64_t id, std::int64_t bytes) {
  Account& account = change(owner);
  std::int64_t& from = account.from[indexOf(sort)];
  from = account.events[indexOf(sort)] == 0 ? id : std::min(from, id);
  ++account.events[indexOf(sort)];
  account.bytes += bytes;
  place(owner, account);
}

void Shares::remove(Owner owner, EventSort sort, std::int64_t bytes) {
  Account& account = change(owner);
  --account.events[indexOf(sort)];
  account.bytes -= bytes;
  if (account.events[0] <= 0 && account.events[1] <= 0) {
    accounts_.erase(owner);
  } else {
    place(owner, account);
  }
}

void Shares::passed(Owner owner, EventSort sort, std::int64_t id) {
  if (!accounts_.contains(owner)) return;
  Account& account = change(owner);
  account.from[indexOf(sort)] = std::max(account.from[indexOf(sort)], id);
  place(owner, account);
}

EventSort Shares::nextSort(Owner owner) const {
  return of(owner).events[indexOf(EventSort::Message)] > 0 ? EventSort::Message : EventSort::Summary;
}

std::optional<Shares::Next> Shares::nextUpTo(std::int64_t last) const {
  for (const auto& [bytes, owner] : order_) {
    const Account& account = accounts_.at(owner);
    for (const EventSort sort : {EventSort::Message, EventSort::Summary}) {
      if (account.events[indexOf(sort)] > 0 && account.from[indexOf(sort)] <= last) return Next{owner, sort};
    }
  }
  return std::nullopt;
}

Shares::Account Shares::of(Owner owner) const {
  const auto found = accounts_.find(owner);
  return found == accounts_.end() ? Account() : found->second;
}

void Shares::rolledBack() {
  for (const auto& [owner, account] : before_) {
    if (const auto found = accounts_.find(owner); found != accounts_.end()) {
      unplace(owner, found->second);
      accounts_.erase(found);
    }
    if (account) {
      place(owner, accounts_[owner] = *account);
    }
  }
  before_.clear();
}

void Shares::clear() noexcept {
  accounts_.clear();
  order_.clear();
  before_.clear();
  events_ = bytes_ = 0;
}

}  // namespace tarn::recorder
