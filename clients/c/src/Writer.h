// SPDX-License-Identifier: Apache-2.0
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

// One a declared shape; never changes while it may be posted with. Owned by its session and freed with it,
// one of fields maybe earlier.
struct tarnreporting_shape {
  tarnreporting_client* client = nullptr;
  tarnreporting_session* session = nullptr;
  tarnreporting_shape* next = nullptr;  // of the session
  // 0 to 1023, by which messages name it; no other shape of the client has it.
  std::uint32_t number = 0;
  // How many keys it has, and the kinds of their values (tarnreporting_kind) in their order.
  std::uint32_t count = 0;
  std::uint8_t kinds[TARNREPORTING_MOST_KEYS] = {};
  // What declareShape says but for its number and the reporter.
  std::uint32_t category = 0;
  std::uint32_t type = 0;
  tarn::reporting::Bytes keysAndKinds;        // two arrays, each after its name
  tarn::reporting::Heads* lastUse = nullptr;  // of a shape that posting of fields made
};

namespace tarn::reporting {

// The part that posting writes to, alone in a page that is locked in memory if the system allows it.
struct Hot {
  // 1 while a call is in progress: finds two threads that post with one writer, and tells who closes when the last is
  // out.
  std::uint32_t inside = 0;  // 1 while a call is in progress
  // 1: posting answers TARNREPORTING_CLOSED.
  std::uint32_t closed = 0;
  ring::RingProducer<> producer;
};

}  // namespace tarn::reporting

// A ring and what belongs to it. Owned by the client, in one of its 32 places, until it is closed and the service has
// taken all of it.
struct tarnreporting_writer {
  // What posting reads. The first is 0 in a child, whose memory has neither `hot` nor the ring.
  const std::uint32_t* alive = nullptr;  // 0 in a child
  tarn::reporting::Hot* hot = nullptr;
  tarnreporting_client* client = nullptr;
  // The eventfd by which the service is woken, and whether post() may write to it or leaves that to the helper.
  int wakeDescriptor = -1;
  bool mayWake = true;

  // The helper's, under the client's lock. The header is where the mapping of the whole ring begins.
  tarnring_header* header = nullptr;
  int memoryDescriptor = -1;
  std::uint32_t dataBytes = 0;
  // Whether the system locked the pages, so that posting never waits for the disk.
  bool locked = false;
  // Whether the service reads the ring on the present connection: nobody asked it to, it has not answered, it does.
  enum class Link : std::uint8_t { None, Asked, Open } link = Link::None;
  std::uint64_t openRequest = 0;  // the id that the answer will have
  std::int64_t retryAt = 0;       // when to ask again, in nanoseconds of the monotonic clock
  // No post comes any more: the place becomes free once everything is taken, and committed too while the service reads.
  bool closing = false;
};

namespace tarn::reporting {

// Makes the ring and the descriptors of a fresh writer: a sealed memory file, every page of it touched and locked if
// that is allowed, and an eventfd. TARNREPORTING_OK or TARNREPORTING_SYSTEM. Nothing is left behind when it fails.
int makeRing(tarnreporting_writer& writer, std::uint32_t dataBytes) noexcept;
// Unmaps and closes all of it. Nobody may be posting.
void freeRing(tarnreporting_writer& writer) noexcept;
// In a forked child, where the memory isn't.
void closeDescriptors(tarnreporting_writer& writer) noexcept;

// Lets no further call in, and tells whether one is inside still. Together they make a closing thread sure of the end:
// both words are stored and loaded in one order for all threads.
void shut(tarnreporting_writer& writer) noexcept;
bool isInside(const tarnreporting_writer& writer) noexcept;
// Wakes the service's reader by one write to the eventfd; leaves errno as it was. For post() and for the helper.
void wakeReader(tarnreporting_writer& writer) noexcept;

// What tarnreporting_post() promises: no lock, no allocation, at most one system call. `stamp`: nanoseconds since 1970
// UTC; null: the time of the call, from a clock that needs no system call. It costs a check and a copy of each value.
int post(tarnreporting_writer& writer, const tarnreporting_shape& shape, const std::uint64_t* stamp,
         const tarnreporting_value* values, std::size_t count) noexcept;

}  // namespace tarn::reporting
