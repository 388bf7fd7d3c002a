// SPDX-License-Identifier: Apache-2.0
#include "plist/PackedBuilder.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/support/HeapUse.h"

namespace tarn::plist {
namespace {

TEST(PackedBuilder, BuildsNestedContainers) {
  KeyListCache cache;
  PackedBuilder builder;
  builder.begin();
  builder.add("a", 1);
  builder.begin();
  builder.add("x", "inner");
  const auto inner = builder.finishDictionary(cache);
  ASSERT_TRUE(inner);
  builder.add("b", *inner);
  builder.begin();
  builder.add(2.5);
  builder.add(*inner);
  builder.add("c", builder.finishArray());
  const auto outer = builder.finishDictionary(cache);
  ASSERT_TRUE(outer);
  EXPECT_EQ(*outer, (Dictionary{{"a", 1}, {"b", Dictionary{{"x", "inner"}}}, {"c", Array{2.5, *inner}}}));
}

TEST(PackedBuilder, NamesValuesAfterwards) {
  KeyListCache cache;
  PackedBuilder builder;
  const Dictionary named{{"a", 1}, {"b", Array{2}}, {"c", 3}};
  for (const bool oneMore : {false, true}) {
    builder.begin();
    builder.add(1);
    builder.add(Array{2});
    builder.nameValues(named.keys(), 2);
    if (oneMore) {
      builder.add("x", 4);
    }
    const auto made = builder.finishDictionary(cache);
    ASSERT_TRUE(made);
    EXPECT_EQ(*made,
              oneMore ? (Dictionary{{"a", 1}, {"b", Array{2}}, {"x", 4}}) : (Dictionary{{"a", 1}, {"b", Array{2}}}));
    EXPECT_EQ(made->keys().hash(), oneMore ? (Dictionary{{"a", 1}, {"b", 2}, {"x", 4}}).keys().hash()
                                           : (Dictionary{{"a", 1}, {"b", 2}}).keys().hash());
  }
}

TEST(PackedBuilder, ANamedKeyGivenOnceMoreIsRefused) {
  KeyListCache cache;
  PackedBuilder builder;
  const Dictionary named{{"a", 1}, {"b", 2}};
  builder.begin();
  builder.add(1);
  builder.nameValues(named.keys(), 1);
  builder.add("a", 2);
  EXPECT_FALSE(builder.finishDictionary(cache));
}

TEST(PackedBuilder, EmptyContainersHoldNothing) {
  KeyListCache cache;
  PackedBuilder builder;
  builder.begin();
  EXPECT_EQ(builder.finishDictionary(cache), Dictionary());
  builder.begin();
  EXPECT_TRUE(builder.finishArray().empty());
}

TEST(PackedBuilder, RefusesAKeyGivenTwiceAndGoesOn) {
  KeyListCache cache;
  PackedBuilder builder;
  builder.begin();
  builder.add("a", Array{1});
  builder.add("a", 2);
  EXPECT_FALSE(builder.finishDictionary(cache));
  builder.begin();
  builder.add("a", 2);
  EXPECT_EQ(builder.finishDictionary(cache), (Dictionary{{"a", 2}}));
}

TEST(PackedBuilder, ResetDropsWhatIsOpen) {
  KeyListCache cache;
  PackedBuilder builder;
  builder.begin();
  builder.add("a", Dictionary{{"x", 1}});
  builder.begin();
  builder.add("b", 1);
  builder.reset();
  builder.begin();
  builder.add("c", 1);
  EXPECT_EQ(builder.finishDictionary(cache), (Dictionary{{"c", 1}}));
}

TEST(KeyListCache, StaysRightWhenListsShareASlot) {
  KeyListCache cache;
  PackedBuilder builder;
  for (int round = 0; round < 3; ++round) {
    for (int i = 0; i < 1000; ++i) {
      const std::string key = "cached" + std::to_string(i);
      builder.begin();
      builder.add(key, i);
      const auto made = builder.finishDictionary(cache);
      ASSERT_TRUE(made);
      ASSERT_EQ((*made)[key].signedValue(), i);
    }
  }
}

// A dictionary of so many long names that goes at once, but for what the cache keeps of it.
void makeLongDictionary(std::size_t count, KeyListCache& cache) {
  constexpr std::size_t kNameBytes = 20'000;
  std::vector<std::string> names;
  for (std::size_t i = 0; i < count; ++i) {
    names.push_back(std::string(kNameBytes, 'k') + std::to_string(i));
  }
  PackedBuilder builder;
  builder.begin();
  for (const std::string& name : names) {
    builder.add(name, 1);
  }
  EXPECT_EQ(builder.finishDictionary(cache)->size(), count);
}

TEST(KeyListCache, KeepsNoLongLists) {
  for (const std::size_t count : {std::size_t{64}, std::size_t{65}, std::size_t{1000}}) {
    const testing::HeapGrowth heap;
    KeyListCache cache;
    makeLongDictionary(count, cache);
    if (count == 64) {
      EXPECT_GT(heap.bytes(), 1'000'000);
    } else {
      EXPECT_LT(heap.bytes(), 200'000);
    }
  }
}

}  // namespace
}  // namespace tarn::plist
