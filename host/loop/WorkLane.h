// SPDX-License-Identifier: Apache-2.0
// WorkLane: what one client has waiting on the server queue, in its own order, and how much of its turn is left.
//
// Work that is handed over while a scope of the lane lives goes to the lane and not to the queue's own list, so that
// whoever schedules the lanes decides which client's work is next. The rest of a piece that gave way stands ahead of
// what waits: the order within one client is that of its requests.
//
// Owned by a connection. Threads: the one that serves the queue.
//
// Unbounded by itself: a connection hands the next request over only when its lane is empty, so a lane holds what one
// request became. A lane that is destroyed destroys its work uncalled.
#pragma once

#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

#include "host/loop/WorkOwner.h"
#include "platform/WorkQueue.h"

namespace tarn::linux_host {

class WorkLane {
 public:
  // While it lives the thread's work on the server queue is for this lane; null: for the queue itself. Scopes nest.
  class Scope {
   public:
    explicit Scope(WorkLane* lane) noexcept : previous_(std::exchange(current_, lane)) {}
    Scope(const Scope&) = delete;
    Scope& operator=(const Scope&) = delete;
    ~Scope() { current_ = previous_; }

   private:
    WorkLane* previous_;
  };

  // `queue` tells lanes of one queue from those of another.
  explicit WorkLane(const platform::WorkQueue* queue) : queue_(queue) { pieces_.reserve(kRoom); }
  WorkLane(const WorkLane&) = delete;
  WorkLane& operator=(const WorkLane&) = delete;

  // The lane that the calling thread works for on this queue; null for none, and so on every other thread.
  static WorkLane* currentOf(const platform::WorkQueue* queue) noexcept {
    return current_ != nullptr && current_->queue_ == queue ? current_ : nullptr;
  }

  bool empty() const noexcept { return pieces() == 0; }
  std::size_t pieces() const noexcept { return pieces_.size() - next_ + (rest_.work ? 1 : 0); }
  // For the session that the caller works for, as that which it puts ahead.
  void add(platform::Work work) { pieces_.emplace_back(std::move(work)); }
  // Ahead of what waits. One at a time: the piece that runs gives way once, as the last thing it does.
  void addNext(platform::Work rest) { rest_ = OwnedWork(std::move(rest)); }
  // The next piece; only when there is one.
  OwnedWork take() {
    if (rest_.work) return std::move(rest_);
    OwnedWork work = std::move(pieces_[next_++]);
    if (next_ == pieces_.size()) {
      pieces_.clear();
      next_ = 0;
    }
    return work;
  }

  // A turn lasts until its credit is spent; what is spent beyond it counts too, and who schedules takes it off later
  // turns. Units of about a microsecond.
  void beginTurn(std::int64_t credit) noexcept {
    credit_ = credit;
    spent_ = 0;
    ended_ = false;
  }
  // Before the first turn there is none.
  bool hasTurn() const noexcept { return !ended_ && spent_ < credit_; }
  // Ends it whatever credit is left, as when what the work makes can't be taken in now. The rest of the credit isn't
  // spent.
  void endTurn() noexcept { ended_ = true; }
  void spend(std::size_t cost) noexcept { spent_ += static_cast<std::int64_t>(cost); }
  // Since beginTurn(), for whoever charges it to the user.
  std::int64_t spent() const noexcept { return spent_; }

 private:
  // For the pieces of the end, so that it never lacks the memory for them.
  static constexpr std::size_t kRoom = 5;

  static inline thread_local WorkLane* current_ = nullptr;

  const platform::WorkQueue* queue_;
  OwnedWork rest_;  // of the piece that gave way
  // Taken from next_ on; emptied once all are taken, so it is a queue without moving anything.
  std::vector<OwnedWork> pieces_;
  // Of pieces_, the first that wasn't taken.
  std::size_t next_ = 0;
  // Of the turn that runs, or of the last one: what it may cost and what it has cost so far.
  std::int64_t credit_ = 0;
  std::int64_t spent_ = 0;
  // Its turn was ended early.
  bool ended_ = false;
};

}  // namespace tarn::linux_host
