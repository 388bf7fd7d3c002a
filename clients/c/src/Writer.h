// tarnreporting_writer and tarnreporting_shape: what the posting thread touches.
//
// The writer's own state lies in memory that isn't given to a forked child, and the ring in memory that is shared with
// the service: so neither is copied on a write after fork(), and posting never meets a page fault. The word that tells
// the child that it is one lies in a page that reads as zero there; it is looked at first.
//
// Made and freed by the client, under its lock. Threads: post() the one that the writer belongs to.
#pragma once

#include <cstdint>

#include "clients/c/include/tarnreporting.h"
#include "clients/c/src/Bytes.h"
#include "clients/ring/RingProducer.h"

namespace tarn::reporting {
struct Heads;
}

// One a declared shape; never changes while it may be posted with.
struct tarnreporting_shape {
  tarnreporting_client* client = nullptr;
  tarnreporting_session* session = nullptr;
  tarnreporting_shape* next = nullptr;  // of the session
  std::uint32_t number = 0;
  std::uint32_t count = 0;
  std::uint8_t kinds[TARNREPORTING_MOST_KEYS] = {};
  // What declareShape says but for its number and the reporter.
  std::uint32_t category = 0;
  std::uint32_t type = 0;
  tarn::reporting::Bytes keysAndKinds;        // two arrays, each after its name
  tarn::reporting::Heads* lastUse = nullptr;  // of a shape that posting of fields made
};

namespace tarn::reporting {

// The part that posting writes to.
struct Hot {
  std::uint32_t inside = 0;  // 1 while a call is in progress
  std::uint32_t closed = 0;
  ring::RingProducer<> producer;
};

}  // namespace tarn::reporting

struct tarnreporting_writer {
  // What posting reads.
  const std::uint32_t* alive = nullptr;  // 0 in a child
  tarn::reporting::Hot* hot = nullptr;
  tarnreporting_client* client = nullptr;
  int wakeDescriptor = -1;
  bool mayWake = true;

  // The helper's, under the client's lock.
  tarnring_header* header = nullptr;
  int memoryDescriptor = -1;
  std::uint32_t dataBytes = 0;
  bool locked = false;
  enum class Link : std::uint8_t { None, Asked, Open } link = Link::None;
  std::uint64_t openRequest = 0;  // the id that the answer will have
  std::int64_t retryAt = 0;       // when to ask again, in nanoseconds of the monotonic clock
  bool closing = false;
};

namespace tarn::reporting {

// Makes the ring and the descriptors of a fresh writer; a result. Nothing is left behind when it fails.
int makeRing(tarnreporting_writer& writer, std::uint32_t dataBytes) noexcept;
void freeRing(tarnreporting_writer& writer) noexcept;
// In a forked child, where the memory isn't.
void closeDescriptors(tarnreporting_writer& writer) noexcept;

// Lets no further call in, and tells whether one is inside still.
void shut(tarnreporting_writer& writer) noexcept;
bool isInside(const tarnreporting_writer& writer) noexcept;
// Wakes the service's reader if it sleeps; for the helper.
void wakeReader(tarnreporting_writer& writer) noexcept;

int post(tarnreporting_writer& writer, const tarnreporting_shape& shape, const std::uint64_t* stamp,
         const tarnreporting_value* values, std::size_t count) noexcept;

}  // namespace tarn::reporting
