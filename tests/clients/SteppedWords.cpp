// SPDX-License-Identifier: Apache-2.0
#include "tests/clients/SteppedWords.h"

#include <cstring>
#include <thread>

namespace tarn::ring {

Schedule*& Schedule::current() {
  thread_local Schedule* schedule = nullptr;
  return schedule;
}

void Schedule::run(const std::function<void()>& first, const std::function<void()>& second, std::uint64_t crashStep) {
  crashStep_ = crashStep;
  turn_ = random(2);
  std::thread one([&] { runActor(0, first); });
  std::thread two([&] { runActor(1, second); });
  one.join();
  two.join();
}

void Schedule::runActor(std::size_t index, const std::function<void()>& body) {
  current() = this;
  {
    std::unique_lock lock(mutex_);
    turnChanged_.wait(lock, [&] { return turn_ == index; });
  }
  body();
  const std::lock_guard lock(mutex_);
  if (!actors_[index].dead) {
    leaveAll(actors_[index]);
  }
  actors_[index].over = true;
  turn_ = 1 - index;
  turnChanged_.notify_all();
}

Schedule::Actor& Schedule::mine() {
  return actors_[turn_];
}

void Schedule::step() {
  std::unique_lock lock(mutex_);
  const std::size_t me = turn_;
  Actor& actor = actors_[me];
  ++actor.steps;
  if (actor.dead) return;
  if (me == 0 && actor.steps == crashStep_) {
    // Of what it had stored, some more may be seen.
    while (!actor.buffer.empty() && random(4) != 0) {
      leaveSome(actor);
    }
    actor.buffer.clear();
    actor.dead = true;
    actor.over = true;
  }
  leaveSome(actors_[random(2)]);
  if (!actors_[1 - me].over && random(2) == 0) {
    turn_ = 1 - me;
    turnChanged_.notify_all();
    turnChanged_.wait(lock, [&] { return turn_ == me; });
  }
}

void Schedule::leaveSome(Actor& actor) {
  if (!actor.buffer.empty()) {
    const std::size_t index = random(actor.buffer.size());
    if (mayLeave(actor, index)) {
      leave(actor, index);
    }
  }
}

bool Schedule::mayLeave(const Actor& actor, std::size_t index) {
  const Store& store = actor.buffer[index];
  for (std::size_t i = 0; i < index; ++i) {
    const Store& before = actor.buffer[i];
    const bool overlaps = before.to < store.to + store.bytes.size() && store.to < before.to + before.bytes.size();
    if (store.release || overlaps) return false;
  }
  return true;
}

void Schedule::leave(Actor& actor, std::size_t index) {
  const Store& store = actor.buffer[index];
  std::memcpy(store.to, store.bytes.data(), store.bytes.size());
  actor.buffer.erase(actor.buffer.begin() + static_cast<std::ptrdiff_t>(index));
}

void Schedule::leaveAll(Actor& actor) {
  while (!actor.buffer.empty()) {
    leave(actor, 0);
  }
}

void Schedule::store(void* to, const void* from, std::size_t bytes, bool release) {
  step();
  Actor& actor = mine();
  const auto* begin = static_cast<const std::byte*>(from);
  if (!actor.dead) {
    actor.buffer.push_back({static_cast<std::byte*>(to), {begin, begin + bytes}, release});
  }
}

void Schedule::load(void* to, const void* from, std::size_t bytes) {
  step();
  std::memcpy(to, from, bytes);
  // An actor sees its own stores at once.
  for (const Store& store : mine().buffer) {
    if (store.to == from && store.bytes.size() == bytes) {
      std::memcpy(to, store.bytes.data(), bytes);
    }
  }
}

void Schedule::fence() {
  step();
  if (!mine().dead) {
    leaveAll(mine());
  }
}

}  // namespace tarn::ring
