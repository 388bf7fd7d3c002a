// SPDX-License-Identifier: Apache-2.0
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

// Owned by the platform, which may lack it. Its cost is the disk's, so whoever writes gathers much at a time.
class OverflowStore {
 public:
  // How much memory logs may take before the store is used, in bytes: those of one session, and all together. The
  // largest numbers stand for no bound.
  struct Bounds {
    // Of one session's log; its oldest messages go first.
    std::size_t bytesOfSession = std::numeric_limits<std::size_t>::max();
    // Of all logs; the largest one gives way.
    std::size_t bytesInAll = std::numeric_limits<std::size_t>::max();
    // Of all logs of one user's sessions; the user's largest one gives way.
    std::size_t bytesOfUser = std::numeric_limits<std::size_t>::max();

    bool operator==(const Bounds&) const = default;
  };
  // What the store calls something that it keeps. Only it knows what the number means.
  using Place = std::uint64_t;

  virtual ~OverflowStore() = default;

  // The same object all the time, whose numbers may change while the server queue isn't at work: it is read there.
  virtual const Bounds& bounds() const = 0;
  // Keeps these bytes, of which there is at least one, until they are removed. After an error nothing is kept; a disk
  // without room is one, and the caller goes on in memory.
  virtual Result<Place> write(std::string_view bytes) = 0;
  // The bytes that were written, all of them; they stay where they are. An error says that they are gone or damaged.
  virtual Result<std::string> read(Place place) = 0;
  // Gives the room back. `place` is one that write() gave and nobody removed yet.
  virtual void remove(Place place) noexcept = 0;
};

}  // namespace tarn::platform
