// SPDX-License-Identifier: Apache-2.0
// BaseUnit: enumerates the wireless earbuds of the device and writes what is known of them into the registration info.
//
// On a platform without accessory queries it finds no devices. The info's "splunk" holds a dictionary for each
// accessory: "lastConnectedEpoch" (seconds since 1970), and what each of its parts tells under "Left", "Right", "Case".
//
// Owner: BTAccess. Threads: the server queue.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "platform/AccessoryQueries.h"
#include "plist/Dictionary.h"
#include "plist/Result.h"

namespace tarn {

// An accessory goes by its index in the last enumeration, from 0; the next enumeration gives the indexes anew.
class BaseUnit {
 public:
  // `queries` may be null; it outlives this.
  explicit BaseUnit(platform::AccessoryQueries* queries);

  // Looks for accessories again, and logs that it does. Forgets the records of the one before. The error is the
  // platform's; there are no accessories then.
  Status enumerateBluetoothDevices();
  // How many the last enumeration found.
  std::uint16_t getDeviceCount() const noexcept { return deviceCount_; }
  // Asks the platform; false without queries.
  bool isDeviceWithCase(std::uint16_t accessoryIndex) const;
  // Adds what is known about a part to the accessory's entry. Accessories come in the order of their indexes. Nothing
  // for an index beyond the last, and for a part of which nothing is known. The moment of the last connection moves
  // from the part to the accessory; of several parts the one loaded last counts.
  void loadParams(platform::AccessoryPart part, std::uint16_t accessoryIndex);

  // The dictionary that the enumeration writes into.
  const std::shared_ptr<plist::Dictionary>& RegistrationInfoParams() const noexcept {  // NOLINT: its given name
    return registrationInfoParams_;
  }
  void setRegistrationInfoParams(std::shared_ptr<plist::Dictionary> params) noexcept {
    registrationInfoParams_ = std::move(params);
  }

 private:
  // Puts the list of records into the info, after each part: whoever looks finds what is known by then.
  void writeRecords();

  platform::AccessoryQueries* const queries_;
  std::uint16_t deviceCount_ = 0;
  std::vector<plist::Dictionary> records_;  // by accessory index
  std::shared_ptr<plist::Dictionary> registrationInfoParams_;
};

}  // namespace tarn
