// RingLimits: the bounds on what clients share with the service, and what happens when one is reached.
#pragma once

#include <chrono>
#include <cstddef>

namespace tarn::linux_host {

struct RingLimits {
  // Open rings of one connection, and of all; a further one is refused.
  std::size_t maxRingsAConnection = 32;
  std::size_t maxRings = 1024;
  // Bytes of records that one connection's rings are read for before others have their turn.
  std::size_t turnBytes = 65536;
  // How often rings are looked at that nothing else leads the loop to.
  std::chrono::milliseconds lookEvery{2};
  // Without records for so long, a ring's reader sleeps until it is woken.
  std::chrono::milliseconds awakeFor{1000};

  bool operator==(const RingLimits&) const = default;
};

}  // namespace tarn::linux_host
