// SPDX-License-Identifier: Apache-2.0
#include "host/socket/FairShares.h"

#include <algorithm>
#include <utility>

namespace tarn::linux_host {

FairShares::~FairShares() {
  for (const std::shared_ptr<ShareParty>& party : parties_) {
    party->fresh.clear();
    party->seats.clear();
  }
}

std::shared_ptr<ShareParty> FairShares::partyOf(std::uint32_t user) {
  std::shared_ptr<ShareParty>& party = byUser_[user];
  if (party == nullptr) {
    party = std::make_shared<ShareParty>(user);
  }
  std::shared_ptr<ShareParty> found = party;
  if (byUser_.size() > usersBeforeForgetting_) {
    std::erase_if(byUser_, [this](const auto& entry) {
      const auto& [known, gone] = entry;
      return gone.use_count() == 1 && gone->credit >= 0 && latelyOf(*gone) == 0;
    });
    usersBeforeForgetting_ = std::max(kKeptUsers, 2 * byUser_.size());
  }
  return found;
}

void FairShares::ready(std::shared_ptr<ShareHolder> holder) noexcept {
  if (std::exchange(holder->queued_, true)) return;
  const std::shared_ptr<ShareParty>& party = holder->party_;
  if (!std::exchange(party->queued, true)) {
    party->credit = std::min(party->credit + kQuantum, kQuantum);
    party->place.front() = party;
    parties_.splice(parties_.end(), party->place);
  }
  Holders& line = holder->credit_ < 0 ? party->seats : party->fresh;
  join(line, std::move(holder));
}

void FairShares::join(Holders& line, std::shared_ptr<ShareHolder> holder) noexcept {
  std::list<std::shared_ptr<ShareHolder>>& place = holder->place_;
  place.front() = std::move(holder);
  line.splice(line.end(), place);
}

std::shared_ptr<ShareHolder> FairShares::takeFirst(Holders& line) noexcept {
  std::shared_ptr<ShareHolder> holder = std::move(line.front());
  holder->place_.splice(holder->place_.end(), line, line.begin());
  return holder;
}

// The user has nothing more to do.
void FairShares::leave(const std::shared_ptr<ShareParty>& party) noexcept {
  party->queued = false;
  party->place.splice(party->place.end(), parties_, std::find(parties_.begin(), parties_.end(), party));
  party->place.front() = nullptr;
}

// One turn of the first user's next seat; its cost. Both go to the end of their lines when their credit is spent.
std::int64_t FairShares::serveOne() {
  ShareParty& party = *parties_.front();
  if (party.credit <= 0) {
    party.credit += kQuantum;
    passOver();
    return parties_.size() == 1 ? 0 : 1;
  }
  const bool takesFresh = !party.fresh.empty() && (party.seats.empty() || party.freshTurns < kFreshTurns);
  party.freshTurns = takesFresh ? party.freshTurns + 1 : 0;
  const std::shared_ptr<ShareHolder> holder = takeFirst(takesFresh ? party.fresh : party.seats);
  holder->credit_ = std::min(holder->credit_ + kQuantum, kQuantum);
  if (holder->credit_ <= 0) {
    join(party.seats, holder);
    return 1;
  }
  holder->queued_ = false;  // what comes for it while it is served counts as more
  const ShareHolder::Turn turn = serve(party, *holder);
  noteDone(party, turn.cost);
  holder->credit_ = std::max(holder->credit_ - turn.cost, -kMostDebt);
  party.credit = std::max(party.credit - turn.cost, -kMostDebt);
  if (turn.more && !std::exchange(holder->queued_, true)) {
    join(party.seats, holder);
  }
  if (party.fresh.empty() && party.seats.empty()) {
    leave(holder->party_);
  }
  return std::max<std::int64_t>(turn.cost, 1);
}

ShareHolder::Turn FairShares::serve(const ShareParty& party, ShareHolder& holder) {
  struct Served {
    explicit Served(const ShareParty*& theOne) : one(theOne) {}
    Served(const Served&) = delete;
    Served& operator=(const Served&) = delete;
    ~Served() { one = nullptr; }
    const ShareParty*& one;
  };
  const Served served(served_ = &party);
  return holder.takeTurn(holder.credit_);
}

void FairShares::passOver() noexcept {
  parties_.splice(parties_.end(), parties_, parties_.begin());
}

std::int64_t FairShares::latelyOf(const ShareParty& party) const noexcept {
  return party.lately >> std::min<std::uint64_t>(fading_ - party.fading, 62);
}

void FairShares::noteDone(ShareParty& party, std::int64_t cost) noexcept {
  party.lately = latelyOf(party) + cost;
  party.fading = fading_;
  lately_ += cost;
  sinceFading_ += cost;
  if (sinceFading_ >= kFadingCost) {
    sinceFading_ = 0;
    lately_ /= 2;
    ++fading_;
  }
}

void FairShares::finishWork() {
  for (std::size_t parties = parties_.size(); parties > 0; --parties) {
    const std::shared_ptr<ShareParty> party = parties_.front();
    for (Holders* const line : {&party->fresh, &party->seats}) {
      // Those that stand in it now: what comes of their work finds nobody to serve it.
      for (std::size_t left = line->size(); left > 0; --left) {
        const std::shared_ptr<ShareHolder> holder = takeFirst(*line);
        holder->queued_ = false;
        holder->finishWork();
      }
    }
    leave(party);
  }
}

}  // namespace tarn::linux_host
