// BTAccess: the accessory reader: has the base unit enumerate the earbuds and gathers what it finds.
//
// Owner: whoever keeps the registration's state. Threads: the server queue.
#pragma once

#include <memory>

#include "plist/Dictionary.h"
#include "plist/Result.h"
#include "telemetry/registration/BaseUnit.h"

namespace tarn {

class BTAccess {
 public:
  // `queries` may be null, then nothing is ever found; it outlives this.
  explicit BTAccess(platform::AccessoryQueries* queries);

  // The registration info of the accessories that are found now. An enumeration that fails leaves no info.
  Result<plist::Dictionary> gatherData();

 private:
  std::shared_ptr<plist::Dictionary> registrationInfo_;
  BaseUnit baseUnit_;
};

}  // namespace tarn
