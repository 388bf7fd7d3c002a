// SPDX-License-Identifier: Apache-2.0
// Several entries that are set in one step are there as if they had been set one after the other.
#include <gtest/gtest.h>

#include <array>
#include <span>
#include <string>
#include <vector>

#include "plist/PackedBuilder.h"

namespace tarn::plist {
namespace {

using Entry = Dictionary::Entry;

const Key kTag("audiotag");
const Key kName("HostApplicationDisplayID");

std::vector<std::string> keysOf(const Dictionary& dictionary) {
  std::vector<std::string> keys;
  for (const Entry& entry : dictionary) {
    keys.emplace_back(entry.key.text());
  }
  return keys;
}

// In one step where that is possible.
void setEntries(Dictionary& dictionary, std::span<const Entry> entries) {
  const PackedBuilder::Addition addition(dictionary.keys(), entries);
  if (addition.isFor(dictionary)) {
    addition.addTo(dictionary);
    return;
  }
  for (const Entry& entry : entries) {
    dictionary.set(entry.key, entry.value);
  }
}

// Sets both ways and compares keys, values and key lists.
void expectTheSame(const Dictionary& before, std::span<const Entry> entries) {
  Dictionary one = before;
  setEntries(one, entries);
  Dictionary other = before;
  for (const Entry& entry : entries) {
    other.set(entry.key, entry.value);
  }
  EXPECT_EQ(keysOf(one), keysOf(other));
  EXPECT_EQ(one, other);
  EXPECT_TRUE(one.sharesKeysWith(other));
  EXPECT_EQ(one.storageBytes(), other.storageBytes());
}

TEST(SetEntries, BothAreAddedInTheirOrder) {
  Dictionary dictionary{{"volume", 0.5}};
  setEntries(dictionary, std::array<Entry, 2>{{{kTag, "PlaybackStart"}, {kName, "player"}}});
  EXPECT_EQ(keysOf(dictionary), (std::vector<std::string>{"volume", "audiotag", "HostApplicationDisplayID"}));
  EXPECT_EQ(dictionary.get(kTag), ValueView("PlaybackStart"));
  EXPECT_EQ(dictionary.get(kName), ValueView("player"));
  EXPECT_EQ(dictionary["volume"], ValueView(0.5));
}

TEST(SetEntries, AreThereAsIfSetOneAfterTheOther) {
  const std::string large(200, 'x');
  const Dictionary inner{{"a", 1}};
  const std::array<Dictionary, 6> before{Dictionary(),
                                         Dictionary{{"volume", 0.5}},
                                         Dictionary{{"audiotag", "old"}, {"volume", 1}},
                                         Dictionary{{"HostApplicationDisplayID", 7}, {"audiotag", 8}},
                                         Dictionary{{"inner", inner}},
                                         Dictionary{{"a", 1}, {"b", 2}, {"c", 3}, {"d", 4}}};
  for (const Dictionary& each : before) {
    expectTheSame(each, std::array<Entry, 2>{{{kTag, "PlaybackStart"}, {kName, "player"}}});
    expectTheSame(each, std::array<Entry, 2>{{{kTag, large}, {kName, "player"}}});
    expectTheSame(each, std::array<Entry, 2>{{{kTag, "PlaybackStart"}, {kName, inner}}});
    expectTheSame(each, std::array<Entry, 2>{{{kTag, ValueView()}, {kName, 3}}});
    expectTheSame(each, std::array<Entry, 1>{{{kName, true}}});
    expectTheSame(each, {});
  }
}

TEST(SetEntries, CopyDoesNotSeeThem) {
  Dictionary dictionary{{"volume", 0.5}, {"inner", Dictionary{{"a", 1}}}};
  const Dictionary copy = dictionary;
  setEntries(dictionary, std::array<Entry, 2>{{{kTag, "PlaybackStart"}, {kName, "player"}}});
  EXPECT_EQ(keysOf(copy), (std::vector<std::string>{"volume", "inner"}));
  EXPECT_EQ(copy["inner"], dictionary["inner"]);
  EXPECT_EQ(dictionary.size(), 4U);
}

TEST(SetEntries, ContainerOutlivesWhatItCameFrom) {
  Dictionary dictionary{{"volume", 0.5}};
  {
    const Dictionary inner{{"a", "a text that is long enough for a block"}};
    setEntries(dictionary, std::array<Entry, 2>{{{kTag, inner}, {kName, "player"}}});
  }
  EXPECT_EQ(dictionary.get(kTag).dictionary()["a"], ValueView("a text that is long enough for a block"));
}

TEST(SetEntries, AreForDictionariesOfTheirKeysAlone) {
  const std::array<Entry, 2> entries{{{kTag, "PlaybackStart"}, {kName, "player"}}};
  const Dictionary volume{{"volume", 0.5}};
  const PackedBuilder::Addition addition(volume.keys(), entries);
  EXPECT_TRUE(addition.isFor(Dictionary{{"volume", "loud"}}));
  EXPECT_FALSE(addition.isFor(Dictionary{{"gain", 0.5}}));
  EXPECT_FALSE(addition.isFor(Dictionary{{"volume", 0.5}, {"gain", 1}}));
  EXPECT_FALSE(addition.isFor(Dictionary()));
}

TEST(SetEntries, AreForNobodyWhereTheyNeedMoreThanOneStep) {
  const std::string large(200, 'x');
  const Dictionary volume{{"volume", 0.5}};
  const Dictionary tagged{{"volume", 0.5}, {"audiotag", "own"}};
  const auto isFor = [](const Dictionary& dictionary, const Entry& entry) {
    return PackedBuilder::Addition(dictionary.keys(), std::array<Entry, 1>{entry}).isFor(dictionary);
  };
  EXPECT_TRUE(isFor(volume, {kTag, "own"}));
  EXPECT_FALSE(isFor(tagged, {kTag, "own"}));
  EXPECT_FALSE(isFor(volume, {kTag, large}));
  EXPECT_FALSE(isFor(volume, {kTag, volume}));
  EXPECT_FALSE(isFor(volume, {kTag, ValueView()}));
  EXPECT_FALSE(isFor(Dictionary(), {kTag, "own"}));
  EXPECT_FALSE(PackedBuilder::Addition().isFor(Dictionary()));
}

}  // namespace
}  // namespace tarn::plist
