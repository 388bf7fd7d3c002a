// SPDX-License-Identifier: Apache-2.0
// SteppedWords: memory in which a test decides who goes on at every single access, and when a store is seen by others.
//
// Two actors run on threads of their own, one at a time. At each access of the ring's memory the running one stops, and
// the schedule (a random stream) lets one of them go on. A store first goes into its actor's buffer and leaves it when
// the schedule says so, in any order but for these: a release store leaves after all that is before it, stores to the
// same place keep their order, a fence empties the buffer. So a missing release or fence shows.
#pragma once

#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <random>
#include <vector>

namespace tarn::ring {

class Schedule {
 public:
  explicit Schedule(std::uint64_t seed) : random_(seed) {}
  Schedule(const Schedule&) = delete;
  Schedule& operator=(const Schedule&) = delete;

  // Runs both to their ends. When `crashStep` isn't 0 the first one dies at that step of its own: from there on what it
  // does reaches nobody.
  void run(const std::function<void()>& first, const std::function<void()>& second, std::uint64_t crashStep = 0);

  // What a running actor's accesses come to. `bytes` at most 1024.
  void store(void* to, const void* from, std::size_t bytes, bool release);
  void load(void* to, const void* from, std::size_t bytes);
  void fence();

  // Of the whole test; asked for by a running actor.
  std::uint64_t random(std::uint64_t below) { return random_() % below; }
  bool firstIsOver() const { return actors_[0].over; }
  // Lets the other go on without an access.
  void step();

  static Schedule*& current();  // of the running actor's thread

 private:
  struct Store {
    std::byte* to;
    std::vector<std::byte> bytes;
    bool release;
  };
  struct Actor {
    std::vector<Store> buffer;
    std::uint64_t steps = 0;
    bool over = false;
    bool dead = false;
  };

  void runActor(std::size_t index, const std::function<void()>& body);
  void leaveSome(Actor& actor);
  static bool mayLeave(const Actor& actor, std::size_t index);
  static void leave(Actor& actor, std::size_t index);
  static void leaveAll(Actor& actor);
  Actor& mine();

  std::mt19937_64 random_;
  Actor actors_[2];
  std::uint64_t crashStep_ = 0;
  std::mutex mutex_;
  std::condition_variable turnChanged_;
  std::size_t turn_ = 0;
};

struct SteppedWords {
  static std::uint64_t load(const std::uint64_t* word) noexcept {
    std::uint64_t value = 0;
    Schedule::current()->load(&value, word, sizeof value);
    return value;
  }
  static std::uint64_t loadAcquire(const std::uint64_t* word) noexcept { return load(word); }
  static void store(std::uint64_t* word, std::uint64_t value) noexcept {
    Schedule::current()->store(word, &value, sizeof value, false);
  }
  static void storeRelease(std::uint64_t* word, std::uint64_t value) noexcept {
    Schedule::current()->store(word, &value, sizeof value, true);
  }
  static void fence() noexcept { Schedule::current()->fence(); }
  static void copyIn(std::byte* ring, const void* from, std::size_t bytes) noexcept {
    Schedule::current()->store(ring, from, bytes, false);
  }
  // In two halves, between which the other may write.
  static void copyOut(void* to, const std::byte* ring, std::size_t bytes) noexcept {
    const std::size_t half = bytes / 2;
    Schedule::current()->load(to, ring, half);
    Schedule::current()->load(static_cast<std::byte*>(to) + half, ring + half, bytes - half);
  }
};

}  // namespace tarn::ring
