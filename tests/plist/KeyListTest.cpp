// SPDX-License-Identifier: Apache-2.0
#include "plist/KeyList.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <thread>
#include <vector>

#include "plist/Dictionary.h"
#include "tests/support/HeapUse.h"

namespace tarn::plist {
namespace {

using testing::HeapGrowth;

constexpr std::ptrdiff_t kSlack = 100'000;

std::vector<Key> makeKeys(int count) {
  std::vector<Key> keys;
  for (int i = 0; i < count; ++i) {
    keys.emplace_back("a key of this test " + std::to_string(i));
  }
  return keys;
}

TEST(Key, EqualTextsAreOneKey) {
  const Key one("volume");
  const Key other(std::string("vol") + "ume");
  EXPECT_EQ(one, other);
  EXPECT_EQ(one.hash(), Key::hashOf("volume"));
  EXPECT_FALSE(one == Key("Volume"));
  EXPECT_TRUE(Key("a b").hasBlank());
  EXPECT_FALSE(Key("a\tb").hasBlank());
}

TEST(Key, TextThatNobodyUsesIsForgotten) {
  const HeapGrowth heap;
  for (int i = 0; i < 1000; ++i) {
    Dictionary dictionary;
    dictionary.set(Key(std::string(10'000, 'k') + std::to_string(i)), 1);
    ASSERT_LT(heap.bytes(), kSlack);
  }
}

TEST(KeyList, SameKeysInTheSameOrderAreOneList) {
  const std::vector<std::string_view> texts{"one", "two"};
  const auto list = KeyList::make(texts);
  ASSERT_TRUE(list);
  EXPECT_EQ(*list, KeyList().appending("one").appending("two"));
  EXPECT_FALSE(*list == KeyList().appending("two").appending("one"));
  EXPECT_EQ(*list, list->appending("three").removing(2));
  EXPECT_EQ(list->removing(1).removing(0), KeyList());
}

TEST(KeyList, RefusesAKeyTwice) {
  const std::vector<std::string_view> few{"one", "two", "one"};
  EXPECT_FALSE(KeyList::make(few));
  std::vector<std::string> names;
  for (int i = 0; i < 40; ++i) {
    names.push_back("name" + std::to_string(i % 39));
  }
  const std::vector<std::string_view> many(names.begin(), names.end());
  EXPECT_FALSE(KeyList::make(many));
}

TEST(KeyList, FindsKeysInShortAndLongLists) {
  for (const int count : {1, 16, 17, 500}) {
    KeyList list;
    for (int i = 0; i < count; ++i) {
      list = list.appending(Key("key" + std::to_string(i)));
    }
    for (int i = 0; i < count; ++i) {
      EXPECT_EQ(list.indexOf(Key("key" + std::to_string(i))), static_cast<std::size_t>(i));
      EXPECT_EQ(list.indexOf("key" + std::to_string(i)), static_cast<std::size_t>(i));
    }
    EXPECT_EQ(list.indexOf("other"), KeyList::npos);
  }
}

TEST(KeyList, ListThatNobodyUsesIsForgotten) {
  const std::vector<Key> keys = makeKeys(1000);
  const HeapGrowth heap;
  for (std::size_t first = 0; first < keys.size(); ++first) {
    std::vector<Key> turned(keys);
    std::rotate(turned.begin(), turned.begin() + static_cast<std::ptrdiff_t>(first), turned.end());
    const auto list = KeyList::make(std::span<const Key>(turned));
    const KeyList longer = list->appending("another");  // which the list keeps for as long as it lives
    ASSERT_EQ(longer.size(), 1001U);
    ASSERT_LT(heap.bytes(), kSlack);
  }
}

TEST(KeyList, ExtensionIsKeptWithTheListThatItExtends) {
  const KeyList base = KeyList().appending("only of this test");
  const Key* where = nullptr;
  std::vector<KeyList> others;  // would take the place of a list that is gone
  for (int i = 0; i < 10; ++i) {
    const KeyList longer = base.appending("extension");
    EXPECT_EQ(&longer[0], i == 0 ? &longer[0] : where);
    where = &longer[0];
    const Key number(std::to_string(i));
    others.push_back(KeyList().appending(number).appending("of another list"));
  }
}

TEST(KeyList, ListExtendedByDifferentKeysGivesEachItsOwnList) {
  const Dictionary base{{"base", 1}};
  for (const char* const key : {"one", "other", "one", "other"}) {
    Dictionary longer = base;
    longer.set(key, 2);
    ASSERT_EQ(longer.size(), 2U);
    EXPECT_EQ(longer.keys()[1].text(), key);
    EXPECT_EQ(longer[key].asInt64(), 2);
  }
}

TEST(KeyListStress, ThreadsMakeAndDropTheSameListsAtOnce) {
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([] {
      for (int i = 0; i < 3000; ++i) {
        Dictionary dictionary{{"shared a", i}, {"shared b", "text"}};
        dictionary.set(Key("shared c" + std::to_string(i % 3)), i);
        const Dictionary copy = dictionary;
        dictionary.remove("shared a");
        EXPECT_EQ(copy["shared a"].signedValue(), i);
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
}

TEST(KeyList, AnEmptyListHoldsNothing) {
  const auto list = KeyList::make(std::span<const Key>{});
  ASSERT_TRUE(list.has_value());
  EXPECT_EQ(list->size(), 0U);
  EXPECT_EQ(list->indexOf(Key("a")), KeyList::npos);
  EXPECT_EQ(list->indexOf("a"), KeyList::npos);
  EXPECT_FALSE(list->hasBlanks());
  EXPECT_EQ(*list, KeyList());
}

TEST(KeyList, AListTellsWhetherAnyKeyHasABlank) {
  const std::vector<Key> keys{Key("a"), Key("b c")};
  EXPECT_TRUE(KeyList::make(keys)->hasBlanks());
  EXPECT_FALSE(KeyList::make(std::span(keys).first(1))->hasBlanks());
}

TEST(KeyList, ALongListFindsItsKeysAndNoOthers) {
  std::vector<Key> keys;
  for (int i = 0; i < 100; ++i) {
    keys.emplace_back("long list " + std::to_string(i));
  }
  const auto list = KeyList::make(keys);
  ASSERT_TRUE(list.has_value());
  for (std::size_t i = 0; i < keys.size(); ++i) {
    EXPECT_EQ(list->indexOf(keys[i]), i);
    EXPECT_EQ(list->indexOf(keys[i].text()), i);
  }
  EXPECT_EQ(list->indexOf("long list 100"), KeyList::npos);
  keys.push_back(keys.front());
  EXPECT_FALSE(KeyList::make(keys).has_value());
}

}  // namespace
}  // namespace tarn::plist
