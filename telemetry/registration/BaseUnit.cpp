// SPDX-License-Identifier: Apache-2.0
#include "telemetry/registration/BaseUnit.h"

#include <string_view>

#include "service/vocabulary/TarnReportingLog.h"
#include "telemetry/registration/TarnReportingRegistrationKeys.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingAudioRegistrationCategory, "BaseUnit"};

const plist::Key& nameOf(platform::AccessoryPart part) {
  static const plist::Key kLeft("Left");
  static const plist::Key kRight("Right");
  static const plist::Key kCase("Case");
  switch (part) {
    case platform::AccessoryPart::Left:
      return kLeft;
    case platform::AccessoryPart::Right:
      return kRight;
    case platform::AccessoryPart::Case:
      break;
  }
  return kCase;
}

}  // namespace

BaseUnit::BaseUnit(platform::AccessoryQueries* queries) : queries_(queries) {
  kLog(LogLevel::Debug, "BaseUnit initialize");
}

Status BaseUnit::enumerateBluetoothDevices() {
  kLog(LogLevel::Default, "Enumerate Bluetooth!");
  records_.clear();
  if (queries_ == nullptr) return {};
  Result<std::uint16_t> found = queries_->enumerate();
  deviceCount_ = found.value;
  return std::move(found.error);
}

bool BaseUnit::isDeviceWithCase(std::uint16_t accessoryIndex) const {
  return queries_ != nullptr && queries_->hasCase(accessoryIndex);
}

void BaseUnit::loadParams(platform::AccessoryPart part, std::uint16_t accessoryIndex) {
  if (queries_ == nullptr || accessoryIndex >= deviceCount_) return;
  plist::Dictionary params = queries_->parameters(part, accessoryIndex);
  if (params.empty()) return;
  if (records_.size() <= accessoryIndex) {
    records_.resize(std::size_t{accessoryIndex} + 1);
  }
  plist::Dictionary& record = records_[accessoryIndex];
  record.set(registration::kLastConnectedEpoch, params.get(registration::kLastConnectedEpoch));
  params.remove(registration::kLastConnectedEpoch);
  record.set(nameOf(part), params);
  writeRecords();
}

void BaseUnit::writeRecords() {
  plist::Array list;
  for (const plist::Dictionary& record : records_) {
    list.append(record);
  }
  registrationInfoParams_->set(registration::kSplunk, list);
}

}  // namespace tarn
