// SPDX-License-Identifier: Apache-2.0
// Message lists on a platform of fakes: their messages, which are numbered, and what is counted of them.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <numeric>
#include <string>
#include <vector>

#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSessionMessageList.h"
#include "testing/FakePlatform.h"
#include "tests/session/log/WatchedStore.h"

namespace tarn::testing {

inline constexpr std::size_t kNoBound = std::size_t{1} << 40U;
inline constexpr std::size_t kKilobyte = 1024;

class MessageListFixture : public ::testing::Test {
 protected:
  using List = TarnReportingSessionMessageList;
  using Record = List::Record;

  // Message number n of that time.
  static Record numbered(int n, double time) {
    return std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{"n", n}, {"tarnreporting_timestamp", time}},
                                                         AudioEventCategory::Playback, AudioEventType::State);
  }
  static std::int64_t numberOf(const Record& record) { return record->message().get("n").asInt64(); }
  static std::vector<std::int64_t> numbers(const List& list) {
    std::vector<std::int64_t> numbers;
    for (const Record& record : list) {
      numbers.push_back(numberOf(record));
    }
    return numbers;
  }
  static std::vector<std::int64_t> upTo(std::int64_t count) {
    std::vector<std::int64_t> numbers(static_cast<std::size_t>(count));
    std::iota(numbers.begin(), numbers.end(), 0);
    return numbers;
  }
  static TarnReportingSessionLogMemory::Usage usage() {
    return ProcessState::of<TarnReportingSessionLogMemory>()->usage();
  }

  FakePlatform platform_;
};

// Lists whose messages take a kilobyte each, to the byte; so bounds can be met exactly. A page holds an eighth of the
// bound of a session.
class KilobyteLists : public MessageListFixture {
 protected:
  // Other bounds from now on, for lists that are made from now on.
  void setBounds(std::size_t ofSession, std::size_t inAll, std::size_t ofUser = kNoBound) {
    platform_.overflow.setBounds(ofSession, inAll, ofUser);
    platform_.facilities().overflow = &store_;
    TarnReportingInstallFacilities(&platform_.facilities());
    List shape;
    shape.append(kilobyte(0, 0));  // pays for the keys, which the others share
  }
  static Record sized(std::size_t bytes, int n, double time) {
    constexpr std::size_t kBesideThePayload = 80;
    std::string text(bytes, 'x');
    while (true) {
      plist::Dictionary payload{{"n", n}, {"tarnreporting_timestamp", time}, {"text", text}};
      const std::size_t cost = kBesideThePayload + payload.storageBytes();
      if (cost <= bytes) {
        EXPECT_EQ(cost, bytes);
        return std::make_shared<TarnReportingSessionMessage>(std::move(payload), AudioEventCategory::Playback,
                                                             AudioEventType::State);
      }
      text.resize(text.size() - (cost - bytes));
    }
  }
  static Record kilobyte(int n, double time) { return sized(kKilobyte, n, time); }
  // Messages as old as their numbers, the oldest first.
  static void fill(List& list, int count, int from = 0) {
    for (int n = from; n < from + count; ++n) {
      list.append(kilobyte(n, n));
    }
  }
  // Messages of which each is older than the one before.
  static void fillBackwards(List& list, int count) {
    for (int n = 0; n < count; ++n) {
      list.append(kilobyte(n, 1000 - n));
    }
  }
  // What a sort makes of those.
  static std::vector<std::int64_t> downFrom(int count) {
    const std::vector<std::int64_t> numbers = upTo(count);
    return {numbers.rbegin(), numbers.rend()};
  }

  WatchedStore store_{platform_.overflow};
};

}  // namespace tarn::testing
