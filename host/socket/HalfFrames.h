// SPDX-License-Identifier: Apache-2.0
// HalfFrames: which connections wait for the rest of a frame, since when and with how many bytes.
//
// A client may stop in the middle of a frame, on purpose or not. What it sent so far takes memory, so it may do so for
// a time only, and all of them together only up to a bound: beyond it the one that has waited longest is cut off.
//
// Owned by ConnectionHost. Threads: the main loop's.
//
//   noted, with its bytes -> more of it came: the same time goes on -> whole, or the connection ended: out
//                         -> its time is up, or it is the oldest of too many bytes -> endHalfFrame()
//
// Entries stand in the order of their begins, so a look at the first one finds who is late.
#pragma once

#include <chrono>
#include <cstddef>
#include <list>
#include <memory>
#include <optional>
#include <string>
#include <utility>

namespace tarn::linux_host {

class HalfFrames {
 public:
  // A connection. Held weakly: one that is gone is dropped when its turn comes.
  class Holder {
   public:
    virtual ~Holder() = default;
    // Its half frame waited too long, or had to make room, as `why` says for the log. Ends the connection, and with it
    // the entry: it must call note() with no bytes.
    virtual void endHalfFrame(const std::string& why) = 0;
  };
  using Moment = std::chrono::nanoseconds;

 private:
  // A connection's half frame: who has it, since when, and how much.
  struct Entry {
    std::weak_ptr<Holder> holder;
    Moment begun;
    std::size_t bytes;
  };

 public:
  // A connection's place among them.
  using Place = std::optional<std::list<Entry>::iterator>;

  // `longest` is how long a half frame may wait for the rest, `maxBytes` what all of them may take together.
  HalfFrames(Moment longest, std::size_t maxBytes) noexcept : longest_(longest), maxBytes_(maxBytes) {}
  // Other bounds, for those that wait too, from the next sweep on.
  void setBounds(Moment longest, std::size_t maxBytes) noexcept {
    longest_ = longest;
    maxBytes_ = maxBytes;
  }
  HalfFrames(const HalfFrames&) = delete;
  HalfFrames& operator=(const HalfFrames&) = delete;

  // The holder has so many bytes of a frame; `anew`: of another one than it had before, whose time begins now. None
  // takes it out. `place` is the connection's own, kept for the next call. Called at the end of a turn, not for each
  // frame.
  void note(Place& place, const std::weak_ptr<Holder>& holder, std::size_t bytes, bool anew, Moment now) {
    if (place && (bytes == 0 || anew)) {
      bytes_ -= (*place)->bytes;
      entries_.erase(*std::exchange(place, std::nullopt));
    }
    if (bytes == 0) return;
    if (!place) {
      place = entries_.insert(entries_.end(), Entry{holder, now, 0});
    }
    bytes_ += bytes - (*place)->bytes;
    (*place)->bytes = bytes;
  }
  // Ends those that waited too long, and the oldest while there are too many bytes. Looks at no more than it ends, and
  // at one.
  void sweep(Moment now) {
    while (!entries_.empty() && (entries_.front().begun + longest_ <= now || bytes_ > maxBytes_)) {
      const bool late = entries_.front().begun + longest_ <= now;
      const auto holder = entries_.front().holder.lock();
      if (holder == nullptr) {
        bytes_ -= entries_.front().bytes;
        entries_.pop_front();
        continue;
      }
      const std::string bytes = std::to_string(entries_.front().bytes) + " bytes of a frame";
      holder->endHalfFrame(late ? bytes + " waited too long for the rest"
                                : bytes + " make room, " + std::to_string(bytes_) + " of " + std::to_string(maxBytes_) +
                                      " are waiting");
    }
  }
  // Nobody is to blame for the time until now, in which nothing was read: the time of each begins anew. Their order
  // stays.
  void restart(Moment now) {
    for (Entry& entry : entries_) {
      entry.begun = now;
    }
  }
  bool empty() const noexcept { return entries_.empty(); }
  bool overfull() const noexcept { return bytes_ > maxBytes_; }
  // Of all half frames together, as their connections last told.
  std::size_t bytes() const noexcept { return bytes_; }

 private:
  Moment longest_;
  std::size_t maxBytes_;
  std::list<Entry> entries_;  // the one that has waited longest first
  // Of all entries.
  std::size_t bytes_ = 0;
};

}  // namespace tarn::linux_host
