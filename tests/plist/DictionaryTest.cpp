// SPDX-License-Identifier: Apache-2.0
#include "plist/Dictionary.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <string>
#include <utility>
#include <vector>

#include "plist/Value.h"

namespace tarn::plist {
namespace {

std::vector<std::string> keysOf(const Dictionary& dictionary) {
  std::vector<std::string> keys;
  for (const auto& entry : dictionary) {
    keys.emplace_back(entry.key.text());
  }
  return keys;
}

TEST(Dictionary, EmptyHoldsNothing) {
  const Dictionary empty;
  EXPECT_TRUE(empty.empty());
  EXPECT_EQ(empty.size(), 0U);
  EXPECT_FALSE(empty.get("any").present());
  EXPECT_TRUE(empty.begin() == empty.end());
  EXPECT_EQ(empty, Dictionary());
  EXPECT_EQ(empty.storageBytes(), 0U);
}

TEST(Dictionary, PicksValuesInOnePass) {
  const Dictionary dictionary{{"a", 1}, {"b", std::string(300, 'x')}, {"c", 2.5}, {"d", "text"}, {"e", Array{1}}};
  std::array<ValueView, 4> slots{};
  slots[1] = 42;
  const Dictionary::Pick picks[] = {{0, 2}, {1, 0}, {1, 3}};
  dictionary.pick(picks, slots);
  EXPECT_EQ(slots[0].doubleValue(), 2.5);
  EXPECT_EQ(slots[1].signedValue(), 42);
  EXPECT_EQ(slots[2].signedValue(), 1);
  EXPECT_EQ(slots[3].array(), Array{1});
}

TEST(Dictionary, PicksNothingOfAnEmptyOne) {
  std::array<ValueView, 1> slots{ValueView(7)};
  Dictionary().pick({}, slots);
  EXPECT_EQ(slots[0].signedValue(), 7);
}

TEST(Dictionary, KeepsInsertionOrderAndReplacesInPlace) {
  Dictionary dictionary{{"b", 1}, {"a", "text"}, {"c", 2.5}};
  dictionary.set("a", 700000);
  EXPECT_EQ(keysOf(dictionary), (std::vector<std::string>{"b", "a", "c"}));
  EXPECT_EQ(dictionary["a"].signedValue(), 700000);
  EXPECT_EQ(dictionary["b"].signedValue(), 1);
  EXPECT_EQ(dictionary["c"].doubleValue(), 2.5);
}

TEST(Dictionary, RememberTheKindOfEveryNumber) {
  const Dictionary dictionary{{"bool", true},  {"signed", -5},      {"unsigned", 5U},       {"float", 0.1F},
                              {"double", 0.1}, {"date", Date{1.5}}, {"large", 1ULL << 63U}, {"small", INT64_MIN}};
  EXPECT_EQ(dictionary["bool"].kind(), Kind::Bool);
  EXPECT_EQ(dictionary["signed"].kind(), Kind::Signed);
  EXPECT_EQ(dictionary["unsigned"].kind(), Kind::Unsigned);
  EXPECT_EQ(dictionary["float"].kind(), Kind::Float);
  EXPECT_EQ(dictionary["double"].kind(), Kind::Double);
  EXPECT_EQ(dictionary["date"].dateValue().epochSeconds, 1.5);
  EXPECT_EQ(dictionary["large"].unsignedValue(), 1ULL << 63U);
  EXPECT_EQ(dictionary["small"].signedValue(), INT64_MIN);
}

TEST(Dictionary, KeepsIntegersOfEveryWidth) {
  const std::array<std::int64_t, 13> numbers{0,     1,      -1,         127,         -128,      128,      32767,
                                             32768, -32769, 2147483647, -2147483648, INT64_MAX, INT64_MIN};
  for (const std::int64_t number : numbers) {
    EXPECT_EQ((Dictionary{{"n", number}}["n"].signedValue()), number);
  }
  for (const std::uint64_t number : {std::uint64_t{0}, std::uint64_t{255}, std::uint64_t{256}, std::uint64_t{65536},
                                     std::uint64_t{1} << 32U, UINT64_MAX}) {
    EXPECT_EQ((Dictionary{{"n", number}}["n"].unsignedValue()), number);
  }
}

TEST(Dictionary, KeepsTextsOfEveryLength) {
  for (const std::size_t length : {0U, 1U, 15U, 255U, 256U, 70000U}) {
    const std::string text(length, 'x');
    Dictionary dictionary{{"before", 1}, {"text", text}, {"data", DataView{text}}, {"behind", 2}};
    EXPECT_EQ(dictionary["text"].text(), text);
    EXPECT_EQ(dictionary["data"].data(), text);
    EXPECT_EQ(dictionary["behind"].signedValue(), 2);
  }
}

TEST(Dictionary, CopyDoesNotSeeLaterChanges) {
  Dictionary original{{"a", 1}, {"nested", Dictionary{{"x", 1}}}};
  const Dictionary copy = original;
  EXPECT_TRUE(copy.sharesStorageWith(original));
  original.set("a", "changed");
  original.set("b", 2);
  Dictionary nested = original["nested"].dictionary();
  nested.set("x", 9);
  EXPECT_EQ(copy["a"].signedValue(), 1);
  EXPECT_EQ(copy.size(), 2U);
  EXPECT_EQ(copy["nested"].dictionary()["x"].signedValue(), 1);
  EXPECT_EQ(original["nested"].dictionary()["x"].signedValue(), 1);
}

TEST(Dictionary, SetTakesAValueOutOfItself) {
  Dictionary dictionary{{"a", "some text that is longer than a few bytes"}, {"b", 1}};
  dictionary.set("b", dictionary["a"]);
  dictionary.set("c", dictionary["a"]);
  dictionary.set("a", 1);
  EXPECT_EQ(dictionary["b"].text(), "some text that is longer than a few bytes");
  EXPECT_EQ(dictionary["c"].text(), "some text that is longer than a few bytes");
}

TEST(Dictionary, SetOfAnAbsentValueStoresNothing) {
  Dictionary dictionary{{"a", 1}};
  dictionary.set("a", ValueView());
  dictionary.set("b", ValueView());
  EXPECT_EQ(dictionary, (Dictionary{{"a", 1}}));
}

TEST(Dictionary, RemoveTakesTheEntryAlone) {
  Dictionary dictionary{{"a", 1}, {"b", Array{1, 2}}, {"c", 3}};
  const Dictionary copy = dictionary;
  EXPECT_TRUE(dictionary.remove("b"));
  EXPECT_FALSE(dictionary.remove("b"));
  EXPECT_EQ(dictionary, (Dictionary{{"a", 1}, {"c", 3}}));
  EXPECT_TRUE(dictionary.remove("a"));
  EXPECT_TRUE(dictionary.remove("c"));
  EXPECT_TRUE(dictionary.empty());
  EXPECT_EQ(copy["b"].array().size(), 2U);
}

TEST(Dictionary, MergeReplacesInPlaceAndAppendsInOrder) {
  Dictionary dictionary{{"a", 1}, {"b", 2}};
  dictionary.merge({{"c", 3}, {"a", "new"}, {"d", 4}});
  EXPECT_EQ(keysOf(dictionary), (std::vector<std::string>{"a", "b", "c", "d"}));
  EXPECT_EQ(dictionary["a"].text(), "new");
  dictionary.merge({});
  EXPECT_EQ(dictionary.size(), 4U);
  Dictionary empty;
  empty.merge(dictionary);
  EXPECT_EQ(empty, dictionary);
}

TEST(Dictionary, MergeOfTheSameKeysTakesTheOthersValues) {
  Dictionary dictionary{{"a", 1}, {"b", "text"}};
  const Dictionary before = dictionary;
  dictionary.merge({{"a", 2.5}, {"b", Array{1}}});
  EXPECT_EQ(dictionary, (Dictionary{{"a", 2.5}, {"b", Array{1}}}));
  EXPECT_EQ(before, (Dictionary{{"a", 1}, {"b", "text"}}));
}

TEST(Dictionary, MergeKeepsTheContainersOfBothSides) {
  Dictionary merged;
  {
    Dictionary left{{"kept", Array{1, "two"}}, {"replaced", Array{3}}, {"n", 1}};
    const Dictionary right{{"replaced", Dictionary{{"x", Array{4}}}}, {"added", Array{5}}};
    left.merge(right);
    merged = left;
  }
  EXPECT_EQ(merged["kept"].array(), (Array{1, "two"}));
  EXPECT_EQ(merged["replaced"].dictionary(), (Dictionary{{"x", Array{4}}}));
  EXPECT_EQ(merged["added"].array(), Array{5});
  EXPECT_EQ(keysOf(merged), (std::vector<std::string>{"kept", "replaced", "n", "added"}));
}

TEST(Dictionary, MergeAddsAnyNumberOfKeysInTheirOrder) {
  for (int count = 0; count <= 40; ++count) {
    Dictionary dictionary{{"first", 1}, {"second", 2}};
    Dictionary added{{"second", "new"}};
    for (int i = 0; i < count; ++i) {
      added.set(Key("added " + std::to_string(i)), i);
    }
    Dictionary expected{{"first", 1}, {"second", "new"}};
    for (int i = 0; i < count; ++i) {
      expected.set(Key("added " + std::to_string(i)), i);
    }
    dictionary.merge(added);
    EXPECT_TRUE(dictionary.sharesKeysWith(expected)) << count;
    EXPECT_EQ(dictionary, expected) << count;
  }
}

TEST(Dictionary, TellsWhichKeysItHas) {
  const Dictionary dictionary{{"a", 1}, {"b", 2}};
  EXPECT_TRUE(dictionary.contains("a"));
  EXPECT_TRUE(dictionary.contains(Key("b")));
  EXPECT_FALSE(dictionary.contains("c"));
  EXPECT_FALSE(dictionary.contains(Key("c")));
  EXPECT_FALSE(Dictionary().contains("a"));
  EXPECT_TRUE(dictionary.hasKeys(dictionary.keys()));
  EXPECT_TRUE(dictionary.hasKeys((Dictionary{{"a", "x"}, {"b", "y"}}.keys())));
  EXPECT_FALSE(dictionary.hasKeys((Dictionary{{"b", 2}, {"a", 1}}.keys())));
  EXPECT_FALSE(dictionary.hasKeys(KeyList()));
  EXPECT_TRUE(Dictionary().hasKeys(KeyList()));
  EXPECT_EQ(dictionary.keysHash(), dictionary.keys().hash());
  EXPECT_EQ(Dictionary().keysHash(), KeyList().hash());
}

TEST(Dictionary, TellsWhetherAKeyStartsWithAPrefix) {
  const Dictionary dictionary{{"", 0}, {"volume", 1}, {"plac_invalid_x", 2}};
  EXPECT_TRUE(dictionary.hasKeyWithPrefix("plac_invalid_"));
  EXPECT_TRUE(dictionary.hasKeyWithPrefix("volume"));
  EXPECT_TRUE(dictionary.hasKeyWithPrefix("v"));
  EXPECT_TRUE(dictionary.hasKeyWithPrefix(""));
  EXPECT_FALSE(dictionary.hasKeyWithPrefix("volumes"));
  EXPECT_FALSE(dictionary.hasKeyWithPrefix("Volume"));
  EXPECT_FALSE(dictionary.hasKeyWithPrefix("olume"));
  EXPECT_FALSE((Dictionary{{"key", "volume"}}.hasKeyWithPrefix("volume")));
  EXPECT_FALSE(Dictionary().hasKeyWithPrefix("volume"));
  EXPECT_FALSE(Dictionary().hasKeyWithPrefix(""));
}

TEST(Dictionary, ThousandsOfKeysAreFoundAndMerged) {
  Dictionary left;
  Dictionary right;
  for (int i = 0; i < 3000; ++i) {
    left.set(Key("left" + std::to_string(i)), i);
    right.set(Key("right" + std::to_string(i)), i);
  }
  left.merge(right);
  ASSERT_EQ(left.size(), 6000U);
  EXPECT_EQ(left["left2999"].signedValue(), 2999);
  EXPECT_EQ(left["right0"].signedValue(), 0);
  EXPECT_FALSE(left.contains("right3000"));
}

TEST(Dictionary, EqualityIgnoresOrderAndNumberKinds) {
  const Dictionary one{{"a", 1}, {"b", 1.0}, {"c", true}};
  const Dictionary other{{"c", 1}, {"b", true}, {"a", 1.0}};
  EXPECT_EQ(one, other);
  EXPECT_FALSE(one == (Dictionary{{"a", 1}, {"b", 1.0}}));
  EXPECT_FALSE(one == (Dictionary{{"a", 1}, {"b", 1.0}, {"d", true}}));
}

TEST(Dictionary, EqualityLooksIntoContainers) {
  const Dictionary one{{"list", Array{1, "x", Dictionary{{"k", 2.0}}}}};
  EXPECT_EQ(one, (Dictionary{{"list", Array{1.0, "x", Dictionary{{"k", 2}}}}}));
  EXPECT_FALSE(one == (Dictionary{{"list", Array{1, "x", Dictionary{{"k", 3}}}}}));
  EXPECT_FALSE(one == (Dictionary{{"list", Array{1, "x"}}}));
}

TEST(Dictionary, EqualsIgnoringTellsBytesFromValues) {
  const Dictionary inner{{"x", 1}};
  const Dictionary likewise{{"x", 1.0}};
  const Array list{1};
  const Array truths{true};
  const std::vector<std::pair<ValueView, ValueView>> equal{
      {0.0, -0.0},   {std::nan("1"), std::nan("2")}, {0.0F, -0.0F},
      {1, 1.0},      {Date{0.0}, Date{-0.0}},        {inner, likewise},
      {list, truths}};
  for (const auto& [left, right] : equal) {
    const Dictionary one{{"time", 1}, {"a", left}, {"b", "text"}};
    EXPECT_TRUE(one.equalsIgnoring({{"time", "later"}, {"a", right}, {"b", "text"}}, std::array{Key("time")}));
    EXPECT_FALSE(one.equalsIgnoring({{"time", "later"}, {"a", right}, {"b", "next"}}, std::array{Key("time")}));
  }
  const std::vector<std::pair<ValueView, ValueView>> unequal{
      {1, 2}, {true, false}, {"ab", "ac"}, {"ab", "abc"}, {DataView{"a"}, DataView{"b"}}, {1.5, 2.5}, {"1", 1}};
  for (const auto& [left, right] : unequal) {
    const Dictionary one{{"time", 1}, {"a", left}, {"b", "text"}};
    EXPECT_FALSE(one.equalsIgnoring({{"time", 2}, {"a", right}, {"b", "text"}}, std::array{Key("time")}));
  }
}

TEST(Dictionary, EqualsIgnoringGoesOnAfterAnIgnoredValueOfAnotherLength) {
  const std::array ignored{Key("time"), Key("last")};
  const Dictionary one{{"a", 1}, {"time", "12"}, {"b", 2}, {"last", 1}};
  EXPECT_TRUE(one.equalsIgnoring({{"a", 1}, {"time", std::string(300, 'x')}, {"b", 2}, {"last", 70000}}, ignored));
  EXPECT_FALSE(one.equalsIgnoring({{"a", 1}, {"time", std::string(300, 'x')}, {"b", 3}, {"last", 70000}}, ignored));
}

TEST(Dictionary, EqualsIgnoringLeavesTheNamedKeysOut) {
  const std::array<Key, 2> ignored{Key("time"), Key("uptime")};
  const Dictionary one{{"a", 1}, {"time", 5.25}, {"b", "text"}, {"uptime", 3}};
  EXPECT_TRUE(one.equalsIgnoring({{"a", 1}, {"time", 9999.5}, {"b", "text"}, {"uptime", 300000}}, ignored));
  EXPECT_TRUE(one.equalsIgnoring({{"a", 1}, {"b", "text"}}, ignored));
  EXPECT_TRUE(one.equalsIgnoring({{"b", "text"}, {"a", 1.0}, {"uptime", "x"}}, ignored));
  EXPECT_FALSE(one.equalsIgnoring({{"a", 2}, {"time", 5.25}, {"b", "text"}, {"uptime", 3}}, ignored));
  EXPECT_FALSE(one.equalsIgnoring({{"a", 1}, {"time", 5.25}, {"b", "texts"}, {"uptime", 3}}, ignored));
  EXPECT_FALSE(one.equalsIgnoring({{"a", 1}, {"b", "text"}, {"c", 1}}, ignored));
  EXPECT_TRUE((Dictionary{{"time", 1}}.equalsIgnoring({}, ignored)));
  EXPECT_FALSE((Dictionary{{"a", 1}}.equalsIgnoring({}, ignored)));
}

TEST(Dictionary, ConstructionWithAKeyTwiceKeepsTheLaterValue) {
  const Dictionary dictionary{{"a", 1}, {"b", 2}, {"a", 3}};
  EXPECT_EQ(dictionary.size(), 2U);
  EXPECT_EQ(dictionary["a"].signedValue(), 3);
}

TEST(Dictionary, StorageCountsContainersInside) {
  const Dictionary flat{{"a", "12345678"}};
  const Dictionary nested{{"a", flat}, {"b", Array{flat}}};
  EXPECT_GE(flat.storageBytes(), 10U);
  EXPECT_GE(nested.storageBytes(), 2 * flat.storageBytes());
}

TEST(Array, AppendsIteratesAndIndexes) {
  Array array{1, "two"};
  const Array copy = array;
  array.append(array[1]);
  array.append(Array{3});
  ASSERT_EQ(array.size(), 4U);
  EXPECT_EQ(array[2].text(), "two");
  EXPECT_EQ(array[3].array()[0].signedValue(), 3);
  EXPECT_FALSE(array[4].present());
  EXPECT_EQ(copy.size(), 2U);
  EXPECT_EQ(copy, (Array{1, "two"}));
}

TEST(Value, OwnsWhatItCopied) {
  Value value;
  EXPECT_FALSE(value.present());
  {
    const std::string text = "a text that goes away, longer than a short string";
    value = Value(text);
  }
  EXPECT_EQ(value.view().text(), "a text that goes away, longer than a short string");
  value = Value(Dictionary{{"a", 1}});
  EXPECT_EQ(value.view().dictionary()["a"].signedValue(), 1);
  EXPECT_EQ(Value(1), Value(1.0));
}

}  // namespace
}  // namespace tarn::plist
