// SPDX-License-Identifier: Apache-2.0
// One value of each kind, to be put under a key whose reader expects another.
#pragma once

#include <cstdint>
#include <limits>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/Value.h"

namespace tarn::testing {

// What stands beside a value is how it reads as a number.
struct OddValue {
  plist::Value value;
  double number;
};

inline std::vector<OddValue> oddValues() {
  return {{true, 1},
          {false, 0},
          {-3, -3},
          {std::numeric_limits<std::uint64_t>::max(), 18446744073709551615.0},
          {std::numeric_limits<std::int64_t>::min(), -9223372036854775808.0},
          {0.5F, 0.5},
          {1e300, 1e300},
          {std::numeric_limits<double>::infinity(), std::numeric_limits<double>::infinity()},
          {-std::numeric_limits<double>::infinity(), -std::numeric_limits<double>::infinity()},
          {plist::Date{600}, 600},
          {"600 seconds", 600},
          {"none", 0},
          {"", 0},
          {plist::DataView{"\x01\x02"}, 0},
          {plist::Array{1, "two"}, 0},
          {plist::Dictionary{{"a", plist::Dictionary{{"b", 1}}}}, 0}};
}

}  // namespace tarn::testing
