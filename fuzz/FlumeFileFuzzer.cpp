// SPDX-License-Identifier: Apache-2.0
// Bytes as a driver's file of report channels: channels that are whole and within the bounds, or a complaint.
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <set>
#include <string>
#include <string_view>

#include "host/drivers/FlumeFile.h"

namespace {

using namespace tarn::linux_host;
using tarn::platform::FlumeChannel;
using tarn::platform::FlumeFormat;

void demand(bool holds) {
  if (!holds) {
    std::abort();
  }
}

void look(const FlumeChannel& channel, const FlumeFileBounds& bounds) {
  demand(channel.name.driver && channel.name.name && channel.format != FlumeFormat::Invalid);
  demand(channel.buckets.empty() || channel.format == FlumeFormat::Histogram);
  demand(channel.states.empty() || channel.format == FlumeFormat::State);
  demand(channel.buckets.size() <= bounds.buckets && channel.states.size() <= bounds.states);
  for (const auto& bucket : channel.buckets) {
    demand(bucket.hits >= 0 && bucket.boundsError == 0);
  }
  std::set<std::string> names;
  for (const auto& state : channel.states) {
    demand(std::isfinite(state.dutyCycle) && names.insert(state.name).second);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  const FlumeFileBounds bounds{8, 8, 8};
  const auto reading = parseFlumeFile(text, bounds);
  demand(reading.value.size() <= bounds.channels);
  demand(reading.error.text().find('\n') == std::string::npos);
  std::set<std::string> names;
  for (const FlumeChannel& channel : reading.value) {
    look(channel, bounds);
    demand(names.insert(*channel.name.name).second);
  }
  return 0;
}
