// SPDX-License-Identifier: Apache-2.0
#include "host/StatusParts.h"

#include <string>
#include <string_view>

#include "host/system/MemoryReserve.h"

namespace tarn::linux_host {

plist::Dictionary expiredStatus(const std::map<recorder::Owner, std::uint64_t>& expired,
                                std::optional<std::uint32_t> onlyUser) {
  plist::Dictionary status;
  for (const auto& [owner, events] : expired) {
    if (onlyUser && owner >= 0 && owner != static_cast<recorder::Owner>(*onlyUser)) continue;
    const std::string nobody = owner == recorder::kServiceItself ? "service" : "others";
    const std::string name = owner >= 0 ? std::to_string(owner) : nobody;
    status.set(std::string_view(name), events);
  }
  return status;
}

plist::Dictionary unexportedStatus(const recorder::Unexported& unexported) {
  plist::Dictionary status{{"count", unexported.count}};
  if (unexported.count > 0) {
    status.set("first", unexported.within.first);
    status.set("last", unexported.within.last);
  }
  return status;
}

plist::Dictionary lossStatus() {
  using Loss = MemoryReserve::Loss;
  const MemoryReserve::Counts counts = MemoryReserve::counts();
  return {{"requests_refused", counts.of(Loss::Request)},
          {"connections_closed", counts.of(Loss::Connection)},
          {"work_given_up", counts.of(Loss::Work)},
          {"reserve_blocks_used", counts.blocksUsed}};
}

}  // namespace tarn::linux_host
