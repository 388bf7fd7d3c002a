// SPDX-License-Identifier: Apache-2.0
// ConnectionEnds: the ends of connections that are under way, and what waits for those that began before it.
//
// What a client's end makes, the summaries of its sessions, is made after the client is gone; so who asks whether all
// is committed that came so far must wait for it. An end needs no memory: each connection brings its place along.
//
// Owned by ConnectionHost. Threads: the main loop's.
#pragma once

#include <cstdint>
#include <deque>
#include <list>
#include <utility>

#include "platform/WorkQueue.h"

namespace tarn::linux_host {

class ConnectionEnds {
 public:
  // A connection's place among them.
  class Place {
    friend class ConnectionEnds;
    std::list<std::uint64_t> own_{0};  // what stands for it in the line, while it is not in it
    std::list<std::uint64_t>::iterator at_ = own_.begin();
  };

  ConnectionEnds() = default;
  ConnectionEnds(const ConnectionEnds&) = delete;
  ConnectionEnds& operator=(const ConnectionEnds&) = delete;

  // Once it has begun, the place must stay until it is finished.
  void begin(Place& place) noexcept {
    if (*place.at_ != 0) return;
    *place.at_ = ++last_;
    ends_.splice(ends_.end(), place.own_);
  }
  // All that the end made is handed over.
  void finish(Place& place) {
    if (!place.own_.empty()) return;
    place.own_.splice(place.own_.end(), ends_, place.at_);
    while (!waiting_.empty() && (ends_.empty() || ends_.front() > waiting_.front().after)) {
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
    std::uint64_t after;
    platform::Work then;
  };

  std::uint64_t last_ = 0;
  std::list<std::uint64_t> ends_;  // by number
  std::deque<Waiting> waiting_;
};

}  // namespace tarn::linux_host
