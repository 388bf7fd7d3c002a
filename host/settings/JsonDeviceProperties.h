// SPDX-License-Identifier: Apache-2.0
// JsonDeviceProperties: what the device is, from a file that holds one JSON object of properties:
// {"InternalBuild": false, "haptics": false}. Without a file the device has neither property.
//
// Texts under the names of the machine's facts (host/settings/MachineFacts.h) take the place of what the machine says
// of itself. A property that the system knows must be true or false, or a text; others are taken as they are, for newer
// systems. Owned by the
// platform and loaded at the start: a device doesn't change while it runs. Threads: any; it never changes once load()
// is over.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/DeviceProperties.h"
#include "plist/Dictionary.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class JsonDeviceProperties final : public platform::DeviceProperties {
 public:
  // The device without a file: both known properties are there and false.
  JsonDeviceProperties();

  // Takes the properties of the file instead, all or none: one that the file leaves out is unknown then, not false. An
  // error reads "FILE:LINE:COLUMN: text", "FILE:LINE: text" or "FILE: text", and the properties are as they were. At
  // most 1 MiB is read. To be called before anybody asks.
  [[nodiscard]] Status load(const std::string& path);

  // Nothing for a property that the file doesn't have, and for one that is no boolean.
  std::optional<bool> boolean(std::string_view name) const override;

  // The machine's facts with what the file says of them in their place.
  plist::Dictionary over(plist::Dictionary machineFacts) const;

 private:
  plist::Dictionary properties_;
};

}  // namespace tarn::linux_host
