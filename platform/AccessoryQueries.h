// SPDX-License-Identifier: Apache-2.0
// AccessoryQueries: the wireless earbuds that this device knows. Threads: the server queue; enumerate may take a while.
#pragma once

#include <cstdint>

#include "plist/Dictionary.h"
#include "plist/Result.h"

namespace tarn::platform {

// The parts of an accessory; the numbers stand in what is reported of them.
enum class AccessoryPart : std::int32_t { Left = 0, Right = 1, Case = 2 };

// Owned by the platform, which may lack it: then nothing is known of accessories. It remembers the last enumeration, so
// counts and indexes belong to that until the next one.
class AccessoryQueries {
 public:
  virtual ~AccessoryQueries() = default;
  // Looks for accessories again; how many there are, which may be none. After an error the earlier enumeration need not
  // hold. The other operations only tell what this one found.
  virtual Result<std::uint16_t> enumerate() = 0;
  // Whether the accessory comes with a charging case. An index beyond the last enumeration has none.
  virtual bool hasCase(std::uint16_t accessoryIndex) const = 0;
  // What is known about a part; empty when there is no such part. The accessory as a whole carries "lastConnectedEpoch"
  // (seconds since 1970) in each of its parts.
  virtual plist::Dictionary parameters(AccessoryPart part, std::uint16_t accessoryIndex) const = 0;
};

}  // namespace tarn::platform
