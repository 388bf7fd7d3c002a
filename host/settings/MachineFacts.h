// SPDX-License-Identifier: Apache-2.0
// MachineFacts: what this machine says of itself, for whoever keeps many: its operating system, who made it, what it
// is.
//
//   os, os_id, os_version    /etc/os-release, else /usr/lib/os-release: its name for people, its id, its version
//   vendor, model            the firmware's tables (DMI), else the device tree, which has the model alone
//   chassis                  /etc/machine-info, else the kind of the firmware's tables: "desktop", "laptop", "tablet",
//                            "convertible", "handset", "server", "embedded"
//
// Read once at the start. Threads: any.
#pragma once

#include <array>
#include <string>
#include <string_view>

#include "plist/Dictionary.h"

namespace tarn::linux_host {

constexpr std::array<std::string_view, 6> kMachineFacts{"os", "os_id", "os_version", "vendor", "model", "chassis"};

// Texts under these names, in this order, from the files below `root`. What can't be read, isn't UTF-8, is empty or
// longer than 256 bytes is left out, and so is what stands in a file of more than 64 KiB; nothing is waited for.
plist::Dictionary readMachineFacts(const std::string& root = "");

}  // namespace tarn::linux_host
