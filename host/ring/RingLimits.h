// SPDX-License-Identifier: Apache-2.0
// RingLimits: the bounds on what clients share with the service, and what happens when one is reached.
#pragma once

#include <chrono>
#include <cstddef>

namespace tarn::linux_host {

// Constants but for tests: no setting changes them. What is refused is counted and told.
struct RingLimits {
  // Open rings of one connection, and of all; a further one is refused. A ring belongs to one thread of a client, so 32
  // are as many threads that post; each is up to 1 MiB of the client's memory and one descriptor of ours.
  std::size_t maxRingsAConnection = 32;
  std::size_t maxRings = 1024;
  // Bytes of records that one connection's rings are read for before others have their turn: as much as a gulp of a
  // socket.
  std::size_t turnBytes = 65536;
  // How often rings are looked at that nothing else leads the loop to. About what a message waits at most in an awake
  // ring of an otherwise idle service.
  std::chrono::milliseconds lookEvery{2};
  // Without records for so long, a ring's reader sleeps until it is woken; so waking costs a client at most about one
  // system call in that time.
  std::chrono::milliseconds awakeFor{1000};

  bool operator==(const RingLimits&) const = default;
};

}  // namespace tarn::linux_host
