// SPDX-License-Identifier: Apache-2.0
// Again: what a database lacks of a device, asked of it: ranges of ids that no message told of.
//
//   "tna" 0x01 | tarn.fleet.v1.Again (batch.proto)
//
// Whoever reads trusts nothing. Threads: any.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/retention/IdRange.h"

namespace tarn::fleet {

// Of one message; what is beyond is asked for another time.
inline constexpr std::size_t kMostRanges = 256;

// The subject on which a device is asked, beside that on which it tells: not one of those that a stream takes.
std::string againSubject(const std::string& subject, std::string_view device);

// Of at most kMostRanges ranges.
std::string packAgain(const std::vector<recorder::IdRange>& ranges);
// Each begins at 1 or later and ends no earlier than it begins. The error says what is wrong with the bytes.
Result<std::vector<recorder::IdRange>> unpackAgain(std::string_view bytes);

}  // namespace tarn::fleet
