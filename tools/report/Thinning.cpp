// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Thinning.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace tarn::report {

namespace {

// Which of `parts` equal parts of the time from `first` to `last` the moment lies in.
std::size_t partOf(double at, double first, double last, std::size_t parts) {
  if (!(last > first)) return 0;
  const double place = std::floor((at - first) / (last - first) * static_cast<double>(parts));
  return std::min(parts - 1, static_cast<std::size_t>(std::max(0.0, place)));
}

// Calls `take(item, isFirstOfItsPart)` for each.
template <class Item, class Take>
void byParts(const std::vector<Item>& items, std::size_t parts, Take take) {
  std::size_t before = std::numeric_limits<std::size_t>::max();
  for (const Item& item : items) {
    const std::size_t part = partOf(item.at, items.front().at, items.back().at, parts);
    take(item, part != before);
    before = part;
  }
}

}  // namespace

std::vector<Mark> joined(const std::vector<Mark>& marks, std::size_t most) {
  if (marks.size() <= most) return marks;
  std::vector<Mark> fewer;
  byParts(marks, most, [&](const Mark& mark, bool isFirst) {
    if (isFirst) {
      fewer.push_back(mark);
    } else {
      fewer.back().count += mark.count;
    }
  });
  return fewer;
}

std::vector<Step> thinned(const std::vector<Step>& steps, std::size_t most) {
  if (steps.size() <= most) return steps;
  std::vector<Step> fewer;
  byParts(steps, most, [&](const Step& step, bool isFirst) {
    if (isFirst) {
      fewer.push_back(step);
    } else {
      fewer.back() = step;
    }
  });
  return fewer;
}

std::vector<Span> longest(const std::vector<Span>& spans, std::size_t most) {
  return longest(spans, most, [](const Span& span) { return span.to - span.from; });
}

}  // namespace tarn::report
