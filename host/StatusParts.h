// SPDX-License-Identifier: Apache-2.0
// Parts of the answer to `status` that are made of what others count. Threads: any.
#pragma once

#include <cstdint>
#include <map>
#include <optional>

#include "plist/Dictionary.h"
#include "recorder/Recorder.h"

namespace tarn::linux_host {

// What retention removed, by the uid of the user or "service" and "others"; of the users only this one, where one is
// named.
plist::Dictionary expiredStatus(const std::map<recorder::Owner, std::uint64_t>& expired,
                                std::optional<std::uint32_t> onlyUser);
// What of it hadn't left the device.
plist::Dictionary unexportedStatus(const recorder::Unexported& unexported);
// What was given up for want of memory.
plist::Dictionary lossStatus();

}  // namespace tarn::linux_host
