#include "host/socket/ConnectionGate.h"

#include <utility>

namespace tarn::linux_host {

void ConnectionGate::releaseHeld() {
  if (held_.empty() || !open()) return;
  // Those that are held anew come behind those that had no turn.
  const auto waiting = std::exchange(held_, {});
  std::size_t next = 0;
  while (next < waiting.size() && open()) {
    waiting[next++]->serveHeldRequest();
  }
  held_.insert(held_.begin(), waiting.begin() + static_cast<std::ptrdiff_t>(next), waiting.end());
}

}  // namespace tarn::linux_host
