// SPDX-License-Identifier: Apache-2.0
// Thinning: as much of a lane as a picture and its table have room for. Stateless. Threads: any.
//
// A session may hold a million messages, and a page must stay small enough to be read; so what is beyond the bound is
// joined or left out here, once, for the picture and for the table, which then say the same. Totals are counted before.
#pragma once

#include <algorithm>
#include <cstddef>
#include <numeric>
#include <vector>

#include "tools/report/SessionPicture.h"

namespace tarn::report {

// At most so many marks: where there are more, the time from the first to the last is cut into equal parts and the
// marks of a part become one, at the first one's time, with the sum of their counts and the first one's text.
std::vector<Mark> joined(const std::vector<Mark>& marks, std::size_t most);
// At most so many steps, likewise: of a part the last step stays.
std::vector<Step> thinned(const std::vector<Step>& steps, std::size_t most);
// At most so many items, those of the greatest length, still in their order; of equal ones the first.
template <class Item, class Length>
std::vector<Item> longest(const std::vector<Item>& items, std::size_t most, Length lengthOf) {
  if (items.size() <= most) return items;
  std::vector<std::size_t> order(items.size());
  std::iota(order.begin(), order.end(), std::size_t{0});
  std::stable_sort(order.begin(), order.end(),
                   [&](std::size_t a, std::size_t b) { return lengthOf(items[a]) > lengthOf(items[b]); });
  order.resize(most);
  std::sort(order.begin(), order.end());
  std::vector<Item> fewer;
  for (const std::size_t index : order) {
    fewer.push_back(items[index]);
  }
  return fewer;
}
// Of spans, by their time.
std::vector<Span> longest(const std::vector<Span>& spans, std::size_t most);

}  // namespace tarn::report
