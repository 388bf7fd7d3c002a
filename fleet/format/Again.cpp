// SPDX-License-Identifier: Apache-2.0
#include "fleet/format/Again.h"

#include <batch.pb.h>

namespace tarn::fleet {

namespace {

constexpr std::string_view kHead("tna\x01", 4);
// Of kMostRanges ranges with the longest numbers.
constexpr std::size_t kMostBytes = 64 * kMostRanges;

}  // namespace

std::string againSubject(const std::string& subject, std::string_view device) {
  return subject + "-again." + std::string(device);
}

std::string packAgain(const std::vector<recorder::IdRange>& ranges) {
  v1::Again again;
  for (const recorder::IdRange& range : ranges) {
    v1::Gap& gap = *again.add_ranges();
    gap.set_first(range.first);
    gap.set_last(range.last);
  }
  return std::string(kHead) + again.SerializeAsString();
}

Result<std::vector<recorder::IdRange>> unpackAgain(std::string_view bytes) {
  if (!bytes.starts_with(kHead)) return {{}, Error{0, "it doesn't begin as such a message does"}};
  if (bytes.size() > kMostBytes) return {{}, Error{0, "it is too long"}};
  bytes.remove_prefix(kHead.size());
  v1::Again again;
  if (!again.ParseFromArray(bytes.data(), static_cast<int>(bytes.size()))) return {{}, Error{0, "it can't be read"}};
  if (again.ranges_size() > static_cast<int>(kMostRanges)) return {{}, Error{0, "it has too many ranges"}};
  Result<std::vector<recorder::IdRange>> ranges;
  for (const v1::Gap& gap : again.ranges()) {
    if (gap.first() < 1 || gap.last() < gap.first()) return {{}, Error{0, "a range isn't one"}};
    ranges.value.push_back({gap.first(), gap.last()});
  }
  return ranges;
}

}  // namespace tarn::fleet
