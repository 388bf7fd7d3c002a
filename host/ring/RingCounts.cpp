// SPDX-License-Identifier: Apache-2.0
#include "host/ring/RingCounts.h"

#include <string_view>

namespace tarn::linux_host {

namespace {

constexpr std::array<std::string_view, kRingRefusals> kRefusalNames{
    "unknown_operation", "bad_arguments", "not_property_list", "unreadable",
    "unknown_shape",     "bad_values",    "out_of_memory",     "admin_only"};

struct FaultRow {
  std::string_view name;
  const char* text;
};
constexpr std::array<FaultRow, kRingFaults> kFaults{{
    {"descriptors", "a memory file and an eventfd expected"},
    {"not_sealed", "a memory file sealed against shrinking and growing expected"},
    {"bad_size", "the memory file has no size that a ring may have"},
    {"bad_header", "the header is not that of a ring"},
    {"in_use", "the ring is open already"},
    {"too_many", "too many rings"},
    {"system", "the system can't open it"},
    {"broken", "its positions or lengths make no sense"},
}};

}  // namespace

const char* textOf(RingFault fault) noexcept {
  return kFaults[static_cast<std::size_t>(fault)].text;
}

void RingCounts::describe(plist::Dictionary& status) const {
  plist::Dictionary refusedByReason;
  for (std::size_t i = 0; i < kRingRefusals; ++i) {
    refusedByReason.set(kRefusalNames[i], refused[i]);
  }
  plist::Dictionary faultsByReason;
  for (std::size_t i = 0; i < kRingFaults; ++i) {
    faultsByReason.set(kFaults[i].name, faults[i]);
  }
  status.set("rings_open", open);
  status.set("rings_total", opened);
  status.set("ring_bytes_open", bytesOpen);
  status.set("ring_messages_received", messages);
  status.set("ring_gaps", gaps);
  status.set("ring_records_refused", refusedByReason);
  status.set("rings_refused", faultsByReason);
  status.set("messages_dropped_by_client", droppedByClients);
}

}  // namespace tarn::linux_host
