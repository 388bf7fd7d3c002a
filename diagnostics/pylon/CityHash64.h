// SPDX-License-Identifier: Apache-2.0
// CityHash64: the 64-bit string hash behind a metric record's hash value, in its second published form, the one with
// three seed constants and one multiplier (the first form has a fourth seed and other results for most lengths).
//
// The result depends on the bytes alone, not on the machine's byte order. Threads: any.
#pragma once

#include <cstdint>
#include <string_view>

namespace pylonmetrics {

// Linear in the bytes, without a copy; an empty text has a value too. Not meant against somebody who looks for
// collisions.
std::uint64_t cityHash64(std::string_view bytes) noexcept;

}  // namespace pylonmetrics
