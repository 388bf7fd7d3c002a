// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/IdRange.h"

#include <algorithm>
#include <cstddef>

namespace tarn::recorder {

namespace {

constexpr std::size_t kRangesTold = 8;

}  // namespace

void addRange(std::vector<IdRange>& ranges, IdRange range) {
  if (!ranges.empty() && range.first <= ranges.back().last + 1) {
    ranges.back().last = std::max(ranges.back().last, range.last);
  } else {
    ranges.push_back(range);
  }
}

std::vector<IdRange> without(IdRange range, const std::vector<IdRange>& others) {
  std::vector<IdRange> left;
  for (const IdRange& other : others) {
    if (other.last < range.first || other.first > range.last) continue;
    if (range.first < other.first) {
      left.push_back({range.first, other.first - 1});
    }
    range.first = other.last + 1;
  }
  if (range.first <= range.last) {
    left.push_back(range);
  }
  return left;
}

std::vector<IdRange> commonOf(const std::vector<IdRange>& some, const std::vector<IdRange>& others) {
  std::vector<IdRange> both;
  for (std::size_t i = 0, j = 0; i < some.size() && j < others.size();) {
    const IdRange range{std::max(some[i].first, others[j].first), std::min(some[i].last, others[j].last)};
    if (range.first <= range.last) {
      both.push_back(range);
    }
    some[i].last < others[j].last ? ++i : ++j;
  }
  return both;
}

std::int64_t countOf(const std::vector<IdRange>& ranges) {
  std::int64_t count = 0;
  for (const IdRange& range : ranges) {
    count += range.count();
  }
  return count;
}

std::string textOf(const std::vector<IdRange>& ranges) {
  std::string text;
  for (std::size_t i = 0; i < std::min(ranges.size(), kRangesTold); ++i) {
    if (i > 0) {
      text += ", ";
    }
    text += std::to_string(ranges[i].first);
    if (ranges[i].last != ranges[i].first) {
      text += "-" + std::to_string(ranges[i].last);
    }
  }
  if (ranges.size() > kRangesTold) {
    text += " and " + std::to_string(ranges.size() - kRangesTold) + " more ranges";
  }
  return text;
}

}  // namespace tarn::recorder
