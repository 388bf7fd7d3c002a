// SPDX-License-Identifier: Apache-2.0
#include "host/settings/JsonDeviceProperties.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <utility>

#include "host/settings/MachineFacts.h"
#include "host/system/JsonValues.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumFileBytes = std::size_t{1} << 20U;
constexpr std::array<std::string_view, 2> kKnown{"InternalBuild", "haptics"};

bool isAmong(const auto& names, std::string_view name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

}  // namespace

JsonDeviceProperties::JsonDeviceProperties() : properties_{{"InternalBuild", false}, {"haptics", false}} {}

Status JsonDeviceProperties::load(const std::string& path) {
  const auto file = readSmallFile(path, kMaximumFileBytes);
  if (file.failed()) return errorOf(path, *file.error);
  const JsonReading reading = readJson(file.value);
  if (reading.fault) return Error{0, path + ":" + reading.fault->description()};
  if (reading.value.kind() != plist::Kind::Dictionary) {
    return Error{0, path + ":1:1: device properties are one JSON object"};
  }
  const plist::Dictionary read = reading.value.view().dictionary();
  std::size_t member = 0;
  for (const plist::Dictionary::Entry& entry : read) {
    const std::string_view name = entry.key.text();
    const char* expected = nullptr;
    if (isAmong(kKnown, name) && entry.value.kind() != plist::Kind::Bool) {
      expected = "true or false";
    } else if (isAmong(kMachineFacts, name) && entry.value.kind() != plist::Kind::Text) {
      expected = "a text";
    }
    if (expected != nullptr) {
      return Error{0, path + ":" + std::to_string(reading.memberLines[member]) + ": \"" + std::string(name) +
                          "\" must be " + expected};
    }
    ++member;
  }
  properties_ = read;
  return {};
}

std::optional<bool> JsonDeviceProperties::boolean(std::string_view name) const {
  const plist::ValueView value = properties_.get(name);
  return value.kind() == plist::Kind::Bool ? std::optional(value.boolValue()) : std::nullopt;
}

plist::Dictionary JsonDeviceProperties::over(plist::Dictionary machineFacts) const {
  for (const plist::Dictionary::Entry& entry : properties_) {
    if (isAmong(kMachineFacts, entry.key.text())) {
      machineFacts.set(entry.key, entry.value);
    }
  }
  return machineFacts;
}

}  // namespace tarn::linux_host
