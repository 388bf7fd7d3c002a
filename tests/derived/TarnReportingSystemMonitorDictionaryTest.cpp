// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSystemMonitorDictionary.h"

#include <gtest/gtest.h>

#include <atomic>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

namespace tarn {
namespace {

using Dictionary = TarnReportingSystemMonitorDictionary;

TEST(TarnReportingSystemMonitorDictionary, UnknownFeatureHasNoState) {
  const Dictionary dictionary;
  EXPECT_TRUE(dictionary.state("ringerstate").empty());
  EXPECT_TRUE(dictionary.states().empty());
}

TEST(TarnReportingSystemMonitorDictionary, StoredStateReplacesTheOlderOne) {
  Dictionary dictionary;
  dictionary.store("ringerstate", {{"ringerstate", false}, {"extra", 1}});
  dictionary.store("ringerstate", {{"ringerstate", true}});
  EXPECT_EQ(dictionary.state("ringerstate"), (plist::Dictionary{{"ringerstate", true}}));
  EXPECT_EQ(dictionary.states().size(), 1U);
}

TEST(TarnReportingSystemMonitorDictionary, StoringAloneTellsNobody) {
  Dictionary dictionary;
  int calls = 0;
  static_cast<void>(dictionary.addObserver("ringerstate", [&](const plist::Key&) { ++calls; }));
  dictionary.store("ringerstate", {{"ringerstate", true}});
  EXPECT_EQ(calls, 0);
}

TEST(TarnReportingSystemMonitorDictionary, ObserversOfTheKeyAreCalledInOrderAndOthersAreNot) {
  Dictionary dictionary;
  std::vector<std::string> calls;
  static_cast<void>(dictionary.addObserver(
      "ringerstate", [&](const plist::Key& key) { calls.push_back("1 " + std::string(key.text())); }));
  static_cast<void>(dictionary.addObserver(
      "device_name", [&](const plist::Key& key) { calls.push_back("2 " + std::string(key.text())); }));
  static_cast<void>(dictionary.addObserver(
      "ringerstate", [&](const plist::Key& key) { calls.push_back("3 " + std::string(key.text())); }));
  dictionary.notifyObservers("ringerstate");
  EXPECT_EQ(calls, (std::vector<std::string>{"1 ringerstate", "3 ringerstate"}));
}

TEST(TarnReportingSystemMonitorDictionary, RemovedObserverIsNotCalled) {
  Dictionary dictionary;
  int calls = 0;
  const auto token = dictionary.addObserver("ringerstate", [&](const plist::Key&) { ++calls; });
  dictionary.removeObserver(token);
  dictionary.removeObserver(token);
  dictionary.notifyObservers("ringerstate");
  EXPECT_EQ(calls, 0);
}

TEST(TarnReportingSystemMonitorDictionary, ObserverMayRemoveItselfAndALaterOne) {
  Dictionary dictionary;
  std::vector<int> calls;
  std::optional<Dictionary::ObserverToken> first;
  std::optional<Dictionary::ObserverToken> second;
  first = dictionary.addObserver("ringerstate", [&](const plist::Key&) {
    calls.push_back(1);
    dictionary.removeObserver(*first);
    dictionary.removeObserver(*second);
  });
  second = dictionary.addObserver("ringerstate", [&](const plist::Key&) { calls.push_back(2); });
  dictionary.notifyObservers("ringerstate");
  dictionary.notifyObservers("ringerstate");
  EXPECT_EQ(calls, std::vector<int>{1});
}

TEST(TarnReportingSystemMonitorDictionary, ObserverAddedByAnObserverIsCalledFromTheNextChangeOn) {
  Dictionary dictionary;
  int late = 0;
  bool added = false;
  static_cast<void>(dictionary.addObserver("ringerstate", [&](const plist::Key&) {
    if (!std::exchange(added, true)) {
      static_cast<void>(dictionary.addObserver("ringerstate", [&](const plist::Key&) { ++late; }));
    }
  }));
  dictionary.notifyObservers("ringerstate");
  EXPECT_EQ(late, 0);
  dictionary.notifyObservers("ringerstate");
  EXPECT_EQ(late, 1);
}

TEST(TarnReportingSystemMonitorDictionary, ObserversRunWithoutTheLock) {
  Dictionary dictionary;
  bool otherThreadGotIn = false;
  static_cast<void>(dictionary.addObserver("ringerstate", [&](const plist::Key&) {
    std::thread other([&] {
      const std::lock_guard guard(dictionary);  // would never return if the lock were held
      otherThreadGotIn = true;
    });
    other.join();
  }));
  dictionary.notifyObservers("ringerstate");
  EXPECT_TRUE(otherThreadGotIn);
}

TEST(TarnReportingSystemMonitorDictionary, LockKeepsOtherThreadsOutUntilItIsReleased) {
  constexpr int kLooks = 10000;
  Dictionary dictionary;
  std::atomic<bool> started{false};
  std::atomic<bool> otherThreadGotIn{false};
  std::unique_lock guard(dictionary);
  std::thread other([&] {
    started = true;
    dictionary.store("ringerstate", {{"ringerstate", true}});
    otherThreadGotIn = true;
  });
  while (!started) {
    std::this_thread::yield();
  }
  for (int look = 0; look < kLooks && !otherThreadGotIn; ++look) {
    std::this_thread::yield();
  }
  EXPECT_FALSE(otherThreadGotIn);
  guard.unlock();
  other.join();
  EXPECT_TRUE(otherThreadGotIn);
}

TEST(TarnReportingSystemMonitorDictionary, LockMayBeTakenAgainByItsHolder) {
  Dictionary dictionary;
  const std::lock_guard guard(dictionary);
  dictionary.store("ringerstate", {{"ringerstate", true}});
  EXPECT_FALSE(dictionary.state("ringerstate").empty());
}

TEST(TarnReportingSystemMonitorDictionaryStress, ObserversComeAndGoWhileStatesChange) {
  Dictionary dictionary;
  constexpr int kRounds = 2000;
  std::atomic<int> calls{0};
  const auto always = dictionary.addObserver("ringerstate", [&](const plist::Key&) { ++calls; });
  std::thread worker([&] {
    for (int round = 0; round < kRounds; ++round) {
      const auto token = dictionary.addObserver("ringerstate", [](const plist::Key&) {});
      static_cast<void>(dictionary.state("ringerstate"));
      dictionary.removeObserver(token);
    }
  });
  for (int round = 0; round < kRounds; ++round) {
    dictionary.store("ringerstate", {{"ringerstate", round}});
    dictionary.notifyObservers("ringerstate");
  }
  worker.join();
  EXPECT_EQ(calls, kRounds);
  EXPECT_EQ(dictionary.state("ringerstate").get("ringerstate").asInt64(), kRounds - 1);
  dictionary.removeObserver(always);
}

}  // namespace
}  // namespace tarn
