// SPDX-License-Identifier: Apache-2.0
// FairShares: whose request is served next, when many connections have some.
//
// Which problem: a request can cost a microsecond or a second, and who sends many or costly ones must not hold up the
// others. How: deficit round robin over the cost of what was done, first among users, then among a user's connections.
//
//   [user] [user] [user]            each visit: credit += kQuantum, served while it lasts
//     |
//     '- [seat] [seat] [seat]       each turn:  credit += kQuantum, one takeTurn() when that made it positive
//
// Who spent more than its credit waits until further visits have paid for it, so that one costly piece costs its sender
// as many turns as many cheap ones. A seat is there only while its holder has something to do; when it is the only one
// it is served on and on. Who comes back and owes nothing is served ahead of the user's others, so that a request now
// and then doesn't wait for a thousand connections that are busy all the time; every few turns one of those is served.
//
// Taking a place in a line needs no memory: each holder and each user brings its own along.
//
// What a user took of what was done lately is remembered, so that who took much waits first when room gets scarce.
//
// Owned by ConnectionHost. Threads: the main loop's.
#pragma once

#include <cstddef>
#include <cstdint>
#include <list>
#include <memory>
#include <unordered_map>
#include <utility>

namespace tarn::linux_host {

class ShareHolder;

// Messages in the second that runs: what a bound on messages a second counts. Seconds are those of the monotonic clock,
// so up to twice the bound may come within one second that lies across two.
struct MessageRate {
  std::int64_t second = 0;
  std::size_t messages = 0;
};

// What one user's connections have in common. Lives as long as any of them, and for as long after that as something is
// held against the user: closing a connection and opening another one pays no debt.
struct ShareParty {
  explicit ShareParty(std::uint32_t theUser) : user(theUser) {}

  const std::uint32_t user;
  // What they have, for the quotas; kept by the connections.
  std::size_t connections = 0;
  std::size_t sessions = 0;
  std::size_t waitingBytes = 0;
  std::size_t logBytes = 0;
  std::size_t largestLog = 0;  // of one connection, when it was last looked for
  MessageRate rate;

  // Cost of what was done for it lately, as of the fading that was the latest then.
  std::int64_t lately = 0;
  std::uint64_t fading = 0;

  // What a visit has left; below zero what was spent beyond it. In units of cost.
  std::int64_t credit = 0;
  // Whether it stands in the line of users.
  bool queued = false;
  std::list<std::shared_ptr<ShareParty>> place{nullptr};  // what stands for it in the line of users, while not in it
  std::list<std::shared_ptr<ShareHolder>> fresh;          // those that have something to do again
  std::list<std::shared_ptr<ShareHolder>> seats;          // those that have something to do still
  int freshTurns = 0;                                     // since one of the seats was served
};

// Who takes turns: a connection. Held by the lines while it waits for one.
class ShareHolder {
 public:
  // What a turn came to.
  struct Turn {
    std::int64_t cost;
    bool more;  // it has more to do
  };

  explicit ShareHolder(std::shared_ptr<ShareParty> party) : party_(std::move(party)) {}
  ShareHolder(const ShareHolder&) = delete;
  ShareHolder& operator=(const ShareHolder&) = delete;
  virtual ~ShareHolder() = default;

  // Does what it has to do until that cost `credit` or more, or there is none left. Throws nothing.
  virtual Turn takeTurn(std::int64_t credit) = 0;
  // Does at once what was begun or handed over for it, and takes nothing new up; for the end of the process. Throws
  // nothing.
  virtual void finishWork() = 0;

 protected:
  // Whether it waits for a turn. False while it is served, so that what comes then counts as more to do.
  bool queued() const noexcept { return queued_; }
  ShareParty& party() const noexcept { return *party_; }

 private:
  friend class FairShares;

  const std::shared_ptr<ShareParty> party_;
  std::list<std::shared_ptr<ShareHolder>> place_{nullptr};  // what stands for it in a line, while it is in none
  std::int64_t credit_ = 0;
  bool queued_ = false;
};

class FairShares {
 public:
  // Cost, in units of about a microsecond, that a visit is worth: some small requests. Smaller, and looking for the
  // next one would cost more than serving it; larger, and a new request would wait longer for each user that is busy.
  static constexpr std::int64_t kQuantum = 32;
  // Nobody pays for more than this that was spent before: a single request that cost a second must not shut its sender
  // out for tens of thousands of visits of others.
  static constexpr std::int64_t kMostDebt = 64 * kQuantum;
  // Turns of those that came back, after which one of the others is served.
  static constexpr int kFreshTurns = 4;
  // What was done lately counts half as much after each time that so much was done by all: about 16 ms of work, so who
  // stops is soon forgiven.
  static constexpr std::int64_t kFadingCost = 16384;
  // Who took more than this part of it, a fourth, is heavy. So there are at most three such, and a user alone always
  // is.
  static constexpr std::int64_t kHeavyPart = 4;

  FairShares() = default;
  FairShares(const FairShares&) = delete;
  FairShares& operator=(const FairShares&) = delete;
  // Lets go of those that wait still, who hold the user in whose lines they stand.
  ~FairShares();

  // The user's own, shared by all holders that live; made on first sight. Users that are gone and owe nothing are
  // forgotten now and then.
  std::shared_ptr<ShareParty> partyOf(std::uint32_t user);
  // Something came for the holder to do. Cheap when it waits for a turn already.
  void ready(std::shared_ptr<ShareHolder> holder) noexcept;
  // Gives turns until they cost `budget` or more, or nobody has anything to do. `mayServe(party)` is asked before each
  // turn of a user; one that may not keeps its place and its credit. Whether somebody is left who could go on at once.
  template <class MayServe>
  bool serve(std::int64_t budget, MayServe mayServe) {
    std::size_t passedOver = 0;
    while (passedOver < parties_.size()) {
      if (!mayServe(std::as_const(*parties_.front()))) {
        passOver();
        ++passedOver;
        continue;
      }
      if (budget <= 0) return true;
      passedOver = 0;
      budget -= serveOne();
    }
    return false;
  }
  // Whose turn it is; null between turns. So that long work can be asked whether its user may go on.
  const ShareParty* served() const noexcept { return served_; }
  // Whether more than a part of what was done lately was done for this user. Costs no walk: what each took is faded
  // when it is looked at.
  bool isHeavy(const ShareParty& party) const noexcept { return latelyOf(party) * kHeavyPart > lately_; }
  // Lets everybody finish what was begun, and forgets the lines; for the end of the process.
  void finishWork();
  // Calls visit(party) for each user that has connections, in no order.
  template <class Visit>
  void forEachParty(Visit visit) const {
    for (const auto& [user, party] : byUser_) {
      if (party.use_count() > 1) {
        visit(*party);
      }
    }
  }

 private:
  static constexpr std::size_t kKeptUsers = 256;

  using Holders = std::list<std::shared_ptr<ShareHolder>>;

  std::int64_t serveOne();
  // The holder's turn, during which served() tells of it.
  ShareHolder::Turn serve(const ShareParty& party, ShareHolder& holder);
  void passOver() noexcept;
  std::int64_t latelyOf(const ShareParty& party) const noexcept;
  void noteDone(ShareParty& party, std::int64_t cost) noexcept;
  static void join(Holders& line, std::shared_ptr<ShareHolder> holder) noexcept;
  static std::shared_ptr<ShareHolder> takeFirst(Holders& line) noexcept;
  void leave(const std::shared_ptr<ShareParty>& party) noexcept;

  std::list<std::shared_ptr<ShareParty>> parties_;  // the one whose visit it is comes first
  std::unordered_map<std::uint32_t, std::shared_ptr<ShareParty>> byUser_;
  // How many are remembered before those that are gone are looked for.
  std::size_t usersBeforeForgetting_ = kKeptUsers;
  const ShareParty* served_ = nullptr;
  std::int64_t lately_ = 0;  // of all users together
  // Cost since the last fading, of which fading_ counts how many there were.
  std::int64_t sinceFading_ = 0;
  std::uint64_t fading_ = 0;
};

}  // namespace tarn::linux_host
