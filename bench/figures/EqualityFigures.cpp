// SPDX-License-Identifier: Apache-2.0
// The comparison of the redundancy test: whether two messages say the same, leaving out when they were sent.
#include <algorithm>
#include <array>
#include <vector>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/figures/Figures.h"
#include "bench/peers/VariantMap.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kComparisons = 200'000;
constexpr std::size_t kMoments = 64;
constexpr double kTarget = 30;

const std::array<plist::Key, 3> kIgnored{plist::Key("processuptime_ms"), plist::Key("systemuptime_sec"),
                                         plist::Key("tarnreporting_timestamp")};

bool isIgnored(const std::string& key) {
  return std::any_of(kIgnored.begin(), kIgnored.end(), [&](const plist::Key& other) { return other.text() == key; });
}

bool equalIgnoring(const VariantMap& a, const VariantMap& b) {
  return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(), [](const auto& left, const auto& right) {
           return left.first == right.first && (left.second == right.second || isIgnored(left.first));
         });
}

double ofDictionaries(std::size_t count, const std::vector<plist::Dictionary>& messages,
                      const plist::Dictionary& earlier, bool expected) {
  return nanosecondsEach(count, [&](std::size_t i) {
    if (messages[i % kMoments].equalsIgnoring(earlier, kIgnored) != expected) {
      fail("a comparison went wrong");
    }
  });
}

double ofMaps(std::size_t count, const std::vector<VariantMap>& messages, const VariantMap& earlier, bool expected) {
  return nanosecondsEach(count, [&](std::size_t i) {
    if (equalIgnoring(messages[i % kMoments], earlier) != expected) {
      fail("a comparison went wrong");
    }
  });
}

void measureCase(const Settings& settings, Table& table, const std::string& name, std::uint64_t content) {
  const plist::Dictionary earlier = makeLoggedMessage(1, 0);
  const VariantMap earlierMap = variantMapOf(earlier);
  std::vector<plist::Dictionary> messages;
  std::vector<VariantMap> maps;
  for (std::uint64_t moment = 1; moment <= kMoments; ++moment) {
    messages.push_back(makeLoggedMessage(content, moment));
    maps.push_back(variantMapOf(messages.back()));
  }
  const std::size_t count = settings.count(kComparisons);
  Samples ours;
  Samples theirs;
  for (int round = 0; round < settings.rounds; ++round) {
    ours.push_back(ofDictionaries(count, messages, earlier, content == 1));
    theirs.push_back(ofMaps(count, maps, earlierMap, content == 1));
  }
  table.addWithTarget({name,
                       nanoseconds(median(ours)),
                       "map of variants " + nanoseconds(median(theirs)),
                       timesOfRounds(ours, theirs),
                       "<= 30 ns",
                       {}},
                      median(ours), kTarget);
}

}  // namespace

void measureEquality(const Settings& settings, Table& table) {
  measureCase(settings, table, "equality of two messages, equal but for the time", 1);
  measureCase(settings, table, "equality of two messages, unequal", 2);
}

}  // namespace tarn::bench
