// SPDX-License-Identifier: Apache-2.0
// BTAccess: the accessory reader: has the base unit enumerate the earbuds and gathers what it finds.
//
// Owner: whoever keeps the registration's state. Threads: the server queue.
#pragma once

#include <memory>

#include "plist/Dictionary.h"
#include "plist/Result.h"
#include "telemetry/registration/BaseUnit.h"

namespace tarn {

// Made by the first enumeration and kept, since the base unit remembers what it found.
class BTAccess {
 public:
  // `queries` may be null, then nothing is ever found; it outlives this.
  explicit BTAccess(platform::AccessoryQueries* queries);

  // The registration info of the accessories that are found now. An enumeration that fails leaves no info. Left and
  // right part of each accessory, and the case of those that have one. The info is begun anew by each call; without an
  // accessory it is empty and has no list of records. Waits for the platform's answers.
  Result<plist::Dictionary> gatherData();

 private:
  // The dictionary that the base unit writes into.
  std::shared_ptr<plist::Dictionary> registrationInfo_;
  BaseUnit baseUnit_;
};

}  // namespace tarn
