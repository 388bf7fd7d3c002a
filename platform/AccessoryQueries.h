// AccessoryQueries: the wireless earbuds that this device knows. Threads: the server queue; enumerate may take a while.
#pragma once

#include <cstdint>

#include "plist/Dictionary.h"
#include "plist/Result.h"

namespace tarn::platform {

// The parts of an accessory.
enum class AccessoryPart : std::int32_t { Left = 0, Right = 1, Case = 2 };

class AccessoryQueries {
 public:
  virtual ~AccessoryQueries() = default;
  // Looks for accessories again; how many there are. The indexes below count within the last enumeration.
  virtual Result<std::uint16_t> enumerate() = 0;
  // Whether the accessory comes with a charging case. An index beyond the last enumeration has none.
  virtual bool hasCase(std::uint16_t accessoryIndex) const = 0;
  // What is known about a part; empty when there is no such part. The accessory as a whole carries "lastConnectedEpoch"
  // (seconds since 1970) in each of its parts.
  virtual plist::Dictionary parameters(AccessoryPart part, std::uint16_t accessoryIndex) const = 0;
};

}  // namespace tarn::platform
