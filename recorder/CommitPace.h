// SPDX-License-Identifier: Apache-2.0
// CommitPace: how fast events are committed just now, and so how many may wait for it.
//
// What a crash may cost is a time. How many events that is depends on disk and processor, and both may be taken by
// others: so the time that an event takes to be written and the time that a commit takes are measured at each
// transaction. A slower one counts for half at once, a faster one for a quarter, so that one that was quick by chance
// doesn't let in more than can be written.
//
// An event that comes while a transaction is under way waits for that one and for its own, at the worst. Where two
// commits would take most of the time, nothing may come in while one is under way: then each waits for its own alone.
//
// Owner: the event writer. Threads: one.
#pragma once

#include <chrono>
#include <cstddef>

namespace tarn::recorder {

class CommitPace {
 public:
  using Duration = std::chrono::nanoseconds;

  // What comes in is to be committed within `window`. So many events may wait however slow it is, or there would be no
  // end.
  CommitPace(Duration window, std::size_t fewest) : window_(window), fewest_(fewest) {}

  // A transaction is over, in which writing so many events took `writing`, and their commit `committing`.
  void note(std::size_t events, Duration writing, Duration committing);

  // How many events may wait, those of the transaction under way included.
  std::size_t mostWaiting() const noexcept;
  // Whether nothing may come in while a transaction is under way.
  bool isInLockstep() const noexcept { return window_ - 2 * commit_ < leastForWriting(); }

 private:
  Duration leastForWriting() const noexcept { return window_ / 4; }

  const Duration window_;
  const std::size_t fewest_;
  Duration event_{0};
  Duration commit_{0};
};

}  // namespace tarn::recorder
