// SPDX-License-Identifier: Apache-2.0
#include "recorder/CommitPace.h"

#include <algorithm>
#include <limits>

namespace tarn::recorder {

namespace {

// Of so few the time for each is chance.
constexpr std::size_t kFewestMeasured = 32;

CommitPace::Duration approach(CommitPace::Duration now, CommitPace::Duration measured) {
  return measured > now ? now + (measured - now) / 2 : now - (now - measured) / 4;
}

}  // namespace

// Beyond these bounds nothing gets any slower, but it would take longer to forget, as after the sleep of a machine.
void CommitPace::note(std::size_t events, Duration writing, Duration committing) {
  commit_ = approach(commit_, std::min(committing, 2 * window_));
  if (events < kFewestMeasured) return;
  event_ = approach(event_, std::min(writing / static_cast<Duration::rep>(events),
                                     2 * window_ / static_cast<Duration::rep>(fewest_)));
}

std::size_t CommitPace::mostWaiting() const noexcept {
  if (event_ <= Duration::zero()) return std::numeric_limits<std::size_t>::max();
  const Duration writing = window_ - (isInLockstep() ? 1 : 2) * commit_;
  return std::max(fewest_, static_cast<std::size_t>(std::max(writing, leastForWriting()) / event_));
}

}  // namespace tarn::recorder
