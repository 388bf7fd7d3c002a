// SPDX-License-Identifier: Apache-2.0
// IdRange: ids of events, told as ranges. Plain values. Threads: any.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace tarn::recorder {

// Ids from the first to the last, both included.
struct IdRange {
  std::int64_t first = 0;
  std::int64_t last = 0;
  std::int64_t count() const noexcept { return last - first + 1; }
  friend bool operator==(const IdRange&, const IdRange&) = default;
};

// Adds to ranges that rise, joining neighbours. `range` begins no earlier than the last one.
void addRange(std::vector<IdRange>& ranges, IdRange range);
// What is left of a range when these, which rise, are taken out.
std::vector<IdRange> without(IdRange range, const std::vector<IdRange>& others);
// What rising ranges have in common, rising.
std::vector<IdRange> commonOf(const std::vector<IdRange>& some, const std::vector<IdRange>& others);
// Ids in all of them.
std::int64_t countOf(const std::vector<IdRange>& ranges);
// "3, 5-9 and 2 more ranges": the first eight.
std::string textOf(const std::vector<IdRange>& ranges);

}  // namespace tarn::recorder
