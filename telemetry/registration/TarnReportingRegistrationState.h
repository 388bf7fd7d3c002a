// SPDX-License-Identifier: Apache-2.0
// TarnReportingRegistrationState: what the registration workers of all sessions share: the accessory reader, what it
// found last, and when to look and to publish next.
//
// Both moments are loaded from the defaults store when they are first wanted, and stored whenever they move, so they
// outlive a restart. The info is stored too, but never read back.
//
// Owner: shared() for the process; whoever makes a worker may hand it another. Threads: the server queue, but for
// scheduleNextInvocation, which a back-end's thread calls too.
#pragma once

#include <atomic>
#include <memory>
#include <optional>
#include <string_view>

#include "plist/Dictionary.h"
#include "plist/Result.h"
#include "telemetry/registration/BTAccess.h"

namespace tarn {

// A moment that can't be stored has an error line and is good for this process still.
class TarnReportingRegistrationState {
 public:
  // The state of this process.
  static std::shared_ptr<TarnReportingRegistrationState> shared();

  // What the last enumeration found; nothing before the first.
  const std::optional<plist::Dictionary>& registrationInfo() const noexcept { return registrationInfo_; }
  // Enumerates with the accessory reader, which is made by the first call. What it finds becomes the info, and is
  // stored; the error of an enumeration that failed leaves the info as it was.
  Status enumerate();
  // For people who look into the defaults of a device.
  void storeRegistrationInfo() const;

  // Epoch seconds; 0 when it was never set. Loaded on first use. When a publication is due, and when the accessories
  // may be enumerated again.
  double nextInvocationEpoch();
  double enumerationCheckEpoch();
  // Sets and stores.
  void scheduleNextInvocation(double epochSeconds);
  // The same for the next enumeration.
  void scheduleEnumerationCheck(double epochSeconds);
  // Sets alone.
  void setEnumerationCheckEpoch(double epochSeconds) noexcept { enumerationCheckEpoch_ = epochSeconds; }

 private:
  std::unique_ptr<BTAccess> accessoryReader_;
  std::optional<plist::Dictionary> registrationInfo_;
  std::atomic<double> nextInvocationEpoch_{0};
  double enumerationCheckEpoch_ = 0;
};

}  // namespace tarn
