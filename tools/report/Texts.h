// SPDX-License-Identifier: Apache-2.0
// Texts: numbers, times and names as the pages say them. Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace tarn::report {

// At most three decimals, without zeros at the end: 20, 0.125, 1200.5. "nan", "inf" and "-inf" where it is none.
std::string numberText(double value);
std::string numberText(std::int64_t value);
// 2026-11-20 10:00:00 in UTC, rounded to the second; epoch seconds outside the years 1 to 9999.
std::string timeText(double epochSeconds);
// The same with three decimals: 2026-11-20 10:00:00.125
std::string preciseTimeText(double epochSeconds);
// 2026-11-20
std::string dayText(double epochSeconds);
// 0.25 s, 20 s, 3 min 20 s, 2 h 5 min, 3 d 4 h: the two largest units, rounded.
std::string durationText(double seconds);
// The text, or as many of its characters with an ellipsis after them.
std::string shortened(std::string_view text, std::size_t characters);

}  // namespace tarn::report
