// SPDX-License-Identifier: Apache-2.0
// What a logged message costs in resident memory, in a session of a million different ones.
#include <malloc.h>

#include <vector>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/ServiceReceiver.h"
#include "bench/figures/Figures.h"
#include "bench/peers/VariantMap.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kMessages = 1'000'000;
constexpr std::size_t kPeerMessages = 100'000;
constexpr std::size_t kOutstanding = 4096;
constexpr double kTarget = 300;

double ofService(const Settings& settings) {
  ServiceReceiver service(settings, {}, Writes::Gathered);
  const std::size_t count = settings.count(kMessages);
  service.stream(count / 100 + 1, kOutstanding);
  const double before = service.residentBytes();
  service.stream(count, kOutstanding);
  return (service.residentBytes() - before) / static_cast<double>(count);
}

// Without the room that the text grew into.
std::string exactly(const std::string& text) {
  return std::string(text.begin(), text.end());
}

// What a million would cost is what fewer cost: nothing is shared between the messages.
template <class Make>
double ofMany(const Settings& settings, Make make) {
  const std::size_t count = settings.quick ? kPeerMessages / 10 : kPeerMessages;
  return measureInChild([&]() -> std::vector<double> {
           std::vector<decltype(make(0))> all;
           all.reserve(count);
           ::malloc_trim(0);  // what this program freed before must not serve again
           const double before = residentBytes(0);
           for (std::size_t i = 0; i < count; ++i) {
             all.push_back(make(i));
           }
           return {(residentBytes(0) - before) / static_cast<double>(count)};
         })
      .front();
}

}  // namespace

void measureMemory(const Settings& settings, Table& table) {
  Samples ours;
  Samples maps;
  Samples raw;
  for (int round = 0; round < settings.rounds; ++round) {
    ours.push_back(ofService(settings));
    maps.push_back(ofMany(settings, [](std::size_t i) { return variantMapOf(makeMessage(i)); }));
    raw.push_back(ofMany(settings, [](std::size_t i) { return exactly(makeCbor(i)); }));
  }
  const auto row = [&](const std::string& peer, const Samples& theirs) {
    return Row{"resident bytes a logged message",
               bytes(median(ours)),
               peer + " " + bytes(median(theirs)),
               times(median(ours) / median(theirs)),
               "",
               {}};
  };
  Row first = row("map of variants", maps);
  first.target = "<= 300 B";
  table.addWithTarget(first, median(ours), kTarget);
  table.add(row("its CBOR", raw));
}

}  // namespace tarn::bench
