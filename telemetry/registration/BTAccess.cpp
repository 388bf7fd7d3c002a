// SPDX-License-Identifier: Apache-2.0
#include "telemetry/registration/BTAccess.h"

#include <cstdint>

#include "service/vocabulary/TarnReportingLog.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingAudioRegistrationCategory, "BTAccess"};

// Comes before the base unit's own line.
std::shared_ptr<plist::Dictionary> beginInfo() {
  kLog(LogLevel::Debug, "BTAccess initialize");
  return std::make_shared<plist::Dictionary>();
}

}  // namespace

BTAccess::BTAccess(platform::AccessoryQueries* queries) : registrationInfo_(beginInfo()), baseUnit_(queries) {
  baseUnit_.setRegistrationInfoParams(registrationInfo_);
}

Result<plist::Dictionary> BTAccess::gatherData() {
  registrationInfo_->clear();
  if (Status error = baseUnit_.enumerateBluetoothDevices(); error.failed()) return {{}, std::move(error)};
  const std::uint16_t count = baseUnit_.getDeviceCount();
  for (std::uint16_t i = 0; i < count; ++i) {
    baseUnit_.loadParams(platform::AccessoryPart::Left, i);
    baseUnit_.loadParams(platform::AccessoryPart::Right, i);
    if (baseUnit_.isDeviceWithCase(i)) {
      baseUnit_.loadParams(platform::AccessoryPart::Case, i);
    }
  }
  return {*registrationInfo_, {}};
}

}  // namespace tarn
