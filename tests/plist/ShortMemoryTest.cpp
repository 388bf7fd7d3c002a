// SPDX-License-Identifier: Apache-2.0
// What values are when memory is missing in the middle of a change: as they were before it.
#include <gtest/gtest.h>

#include <string>

#include "plist/Dictionary.h"
#include "plist/KeyList.h"
#include "plist/PackedBuilder.h"
#include "tests/support/FailingAllocations.h"
#include "tests/support/HeapUse.h"

namespace tarn::plist {
namespace {

using testing::failEachAllocation;
using testing::FailingAllocations;

class ShortMemory : public ::testing::Test {
 protected:
  // Each failing allocation of the change leaves the dictionary as it is; one without leaves it changed.
  template <class Change>
  static void expectAllOrNothing(const Dictionary& before, const Change& change) {
    const std::string text = description(before);
    Dictionary changed;
    const auto attempt = [&] {
      changed = Dictionary();
      for (const Dictionary::Entry& entry : before) {  // a block that nobody shares
        changed.set(entry.key, entry.value);
      }
      started_ = true;
      change(changed);
    };
    const int failed = failEachAllocation(
        [&] {
          started_ = false;
          attempt();
        },
        [&] {
          if (started_) {
            EXPECT_EQ(description(changed), text);
          }
        });
    EXPECT_GT(failed, 0);
    EXPECT_NE(description(changed), text);
  }

  static std::string description(const Dictionary& dictionary) {
    std::string text;
    appendDescription(text, dictionary);
    return text;
  }

  static inline bool started_ = false;
};

const Dictionary kSome{{"name", "a text that needs some room of its own"}, {"number", 7}};
const Dictionary kNested{{"inner", kSome}, {"after", 1}};

TEST_F(ShortMemory, AFirstEntryIsSetOrNot) {
  expectAllOrNothing({}, [](Dictionary& changed) { changed.set(Key("first-short-memory"), "value"); });
}

TEST_F(ShortMemory, AFurtherEntryIsSetOrNot) {
  expectAllOrNothing(kSome,
                     [](Dictionary& changed) { changed.set(Key("further-short-memory"), std::string(300, 'x')); });
}

TEST_F(ShortMemory, AnEntryIsReplacedOrNot) {
  expectAllOrNothing(kSome, [](Dictionary& changed) { changed.set(Key("name"), std::string(500, 'y')); });
}

TEST_F(ShortMemory, AContainerThatIsReplacedStaysWholeUntilThen) {
  expectAllOrNothing(kNested, [](Dictionary& changed) { changed.set(Key("inner"), std::string(500, 'z')); });
}

TEST_F(ShortMemory, AContainerIsPutInOrNot) {
  expectAllOrNothing(kSome, [](Dictionary& changed) { changed.set(Key("name"), kNested); });
}

TEST_F(ShortMemory, AnEntryIsRemovedOrNot) {
  expectAllOrNothing(kNested, [](Dictionary& changed) { changed.remove(Key("after")); });
}

TEST_F(ShortMemory, DictionariesAreMergedOrNot) {
  expectAllOrNothing(kSome, [](Dictionary& changed) { changed.merge({{"merged-a", 1}, {"merged-b", kSome}}); });
}

TEST_F(ShortMemory, NothingIsKeptOfAContainerThatFoundNoPlace) {
  const Dictionary inner{{"key", std::string(1000, 'k')}};
  Dictionary outer;
  const auto grow = [&] { outer.set(Key("short-memory-container"), inner); };
  grow();
  outer.clear();
  const testing::HeapGrowth growth;
  for (int i = 0; i < 50; ++i) {
    failEachAllocation(grow, [] {});
    outer.clear();
  }
  EXPECT_LT(growth.bytes(), 20000);
}

TEST_F(ShortMemory, KeysThatFoundNoPlaceInTheirTableAreGivenBack) {
  const std::string prefix = "a key that nobody else has, of some length, number ";
  int number = 0;
  const testing::HeapGrowth growth;
  for (int i = 0; i < 200; ++i) {
    ++number;
    failEachAllocation([&] { Key(prefix + std::to_string(number)); }, [] {});
  }
  EXPECT_LT(growth.bytes(), 10000);
}

TEST_F(ShortMemory, ABuilderThatIsResetBuildsAgain) {
  PackedBuilder builder;
  KeyListCache cache;
  std::optional<Dictionary> built;
  const auto build = [&] {
    built.reset();
    builder.begin();
    builder.add("short-memory-built", std::string(400, 'b'));
    builder.add("short-memory-inner", kSome);
    built = builder.finishDictionary(cache);
  };
  const int failed = failEachAllocation(build, [&] { builder.reset(); });
  EXPECT_GT(failed, 0);
  ASSERT_TRUE(built);
  EXPECT_EQ(built->size(), 2U);
}

}  // namespace
}  // namespace tarn::plist
