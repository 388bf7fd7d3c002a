// OverflowStore: where the oldest messages of the sessions' logs wait when memory has no room for them.
//
// What lies there is the process's own for as long as it runs: nothing of it is found again by a later run, and nobody
// else reads it.
//
// Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::platform {

class OverflowStore {
 public:
  // How much memory logs may take before the store is used.
  struct Bounds {
    std::size_t bytesOfSession = std::numeric_limits<std::size_t>::max();
    std::size_t bytesInAll = std::numeric_limits<std::size_t>::max();

    bool operator==(const Bounds&) const = default;
  };
  using Place = std::uint64_t;

  virtual ~OverflowStore() = default;

  virtual Bounds bounds() const = 0;
  // Keeps these bytes, of which there is at least one, until they are removed. After an error nothing is kept.
  virtual Result<Place> write(std::string_view bytes) = 0;
  virtual Result<std::string> read(Place place) = 0;
  virtual void remove(Place place) noexcept = 0;
};

}  // namespace tarn::platform
