// SPDX-License-Identifier: Apache-2.0
// DelayedWork: pieces of work that wait for their moment, earliest first, equal moments in the order in which they
// came. Owned by a queue or a pool, under its lock.
//
// A binary heap: adding and taking cost the logarithm of what waits, looking at the earliest nothing. Its room grows
// with the most that ever waited and isn't given back. Moments are on the monotonic clock. It never looks at a clock
// itself, so tests move the time.
#pragma once

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <limits>
#include <utility>
#include <vector>

namespace tarn::linux_host {

// `now` plus `delay`, held to the range: a delay that is too long for the clock never ends.
inline std::chrono::nanoseconds deadlineAfter(std::chrono::nanoseconds now, std::chrono::nanoseconds delay) noexcept {
  return delay > std::chrono::nanoseconds::max() - now ? std::chrono::nanoseconds::max() : now + delay;
}

// `Item` is whatever the owner keeps for its piece of work; it is moved in and out, never copied.
template <class Item>
class DelayedWork {
 public:
  // Takes the item in; may allocate.
  void add(std::chrono::nanoseconds deadline, Item item) {
    heap_.push_back({deadline, nextSequence_++, std::move(item)});
    std::push_heap(heap_.begin(), heap_.end(), later);
  }
  // Whether nothing waits, due or not.
  bool empty() const noexcept { return heap_.empty(); }
  // Of the earliest; only when there is one.
  std::chrono::nanoseconds deadline() const noexcept { return heap_.front().deadline; }
  bool due(std::chrono::nanoseconds now) const noexcept { return !heap_.empty() && heap_.front().deadline <= now; }
  // How many moments have come. A walk over all that waits, so it is for reports and not for each turn.
  std::size_t dueCount(std::chrono::nanoseconds now) const noexcept {
    return static_cast<std::size_t>(
        std::count_if(heap_.begin(), heap_.end(), [now](const Entry& entry) { return entry.deadline <= now; }));
  }
  // The earliest; only when there is one.
  const Item& earliest() const noexcept { return heap_.front().item; }
  // Takes the earliest out.
  Item take() {
    std::pop_heap(heap_.begin(), heap_.end(), later);
    Item item = std::move(heap_.back().item);
    heap_.pop_back();
    return item;
  }

 private:
  // The sequence breaks ties: a heap alone keeps no order among equals.
  struct Entry {
    std::chrono::nanoseconds deadline;
    std::uint64_t sequence;
    Item item;
  };
  // The order of the heap, whose front is the earliest.
  static bool later(const Entry& a, const Entry& b) noexcept {
    return a.deadline != b.deadline ? a.deadline > b.deadline : a.sequence > b.sequence;
  }

  std::vector<Entry> heap_;
  std::uint64_t nextSequence_ = 0;
};

}  // namespace tarn::linux_host
