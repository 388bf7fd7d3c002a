// ConnectionEnds: the ends of connections that are under way, and what waits for those that began before it.
//
// What a client's end makes, the summaries of its sessions, is made after the client is gone; so who asks whether all
// is committed that came so far must wait for it.
//
// Owned by ConnectionHost. Threads: the main loop's.
#pragma once

#include <cstdint>
#include <deque>
#include <set>
#include <utility>

#include "platform/WorkQueue.h"

namespace tarn::linux_host {

class ConnectionEnds {
 public:
  // A connection's place among them; 0: it isn't ending.
  using Place = std::uint64_t;

  ConnectionEnds() = default;
  ConnectionEnds(const ConnectionEnds&) = delete;
  ConnectionEnds& operator=(const ConnectionEnds&) = delete;

  void begin(Place& place) {
    if (place == 0) {
      place = ++last_;
      ends_.insert(place);
    }
  }
  // All that the end made is handed over.
  void finish(Place place) {
    ends_.erase(place);
    while (!waiting_.empty() && (ends_.empty() || *ends_.begin() > waiting_.front().after)) {
      platform::Work then = std::move(waiting_.front().then);
      waiting_.pop_front();
      then();
    }
  }
  // Calls `then` once all ends that are under way now are over: at once when there is none. Ends that begin later
  // aren't waited for, so a stream of clients that go can't hold anybody up. It is destroyed uncalled with this.
  void afterThese(platform::Work then) {
    if (ends_.empty()) {
      then();
    } else {
      waiting_.push_back({last_, std::move(then)});
    }
  }

 private:
  // Somebody who waits for the ends up to this number; numbers only grow, so those who wait stand in order.
  struct Waiting {
    Place after;
    platform::Work then;
  };

  Place last_ = 0;
  std::set<Place> ends_;
  std::deque<Waiting> waiting_;
};

}  // namespace tarn::linux_host
