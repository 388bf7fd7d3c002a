// SPDX-License-Identifier: Apache-2.0
// A draft is the dictionary that a builder would have made of the same values.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "plist/PackedBuilder.h"

namespace tarn::plist {
namespace {

using Entry = Dictionary::Entry;

const std::string kLarge(300, 'x');

std::vector<ValueView> everyKind() {
  return {true,
          -1,
          std::int64_t{40'000},
          std::numeric_limits<std::int64_t>::min(),
          std::numeric_limits<std::uint64_t>::max(),
          0.1F,
          0.1,
          Date{1.5},
          "text",
          "",
          kLarge,
          DataView{"bytes"},
          DataView{kLarge}};
}

KeyList keysFor(std::size_t count) {
  std::vector<std::string> texts;
  for (std::size_t i = 0; i < count; ++i) {
    texts.push_back("key" + std::to_string(i));
  }
  const std::vector<std::string_view> views(texts.begin(), texts.end());
  return *KeyList::make(views);
}

void fill(PackedBuilder::Draft& draft, const std::vector<ValueView>& values, const KeyList& keys) {
  std::size_t most = 0;
  for (const ValueView& value : values) {
    most += PackedBuilder::Draft::kMostValueBytes + (value.isText() ? value.text().size() : 0) +
            (value.kind() == Kind::Data ? value.data().size() : 0);
  }
  draft.begin(most);
  for (const ValueView& value : values) {
    draft.add(value);
  }
  draft.finish(keys);
}

Dictionary built(const std::vector<ValueView>& values, const KeyList& keys) {
  PackedBuilder builder;
  builder.begin();
  for (const ValueView& value : values) {
    builder.add(value);
  }
  return builder.finishDictionary(keys);
}

void expectTheSame(const Dictionary& one, const Dictionary& other) {
  EXPECT_EQ(description(one), description(other));
  EXPECT_EQ(one, other);
  EXPECT_TRUE(one.sharesKeysWith(other));
  EXPECT_EQ(one.storageBytes(), other.storageBytes());
}

TEST(PackedDraft, BecomesWhatABuilderMakesOfTheSameValues) {
  const auto values = everyKind();
  const KeyList keys = keysFor(values.size());
  PackedBuilder::Draft draft;
  fill(draft, values, keys);
  expectTheSame(draft.dictionary(), built(values, keys));
  for (std::size_t i = 0; i < values.size(); ++i) {
    EXPECT_EQ(draft.at(i), values[i]);
    EXPECT_EQ(draft.at(i).kind(), values[i].kind());
  }
}

TEST(PackedDraft, PacksWhatItIsToldTheKindOfLikeAnyOther) {
  const std::vector<std::int64_t> integers{0, -1, 127, -128, 128, 32767, 32768, -32769, 2147483647, 2147483648};
  const std::vector<std::string> texts{"", "text", std::string(255, 'x'), std::string(256, 'x')};
  std::vector<ValueView> values;
  PackedBuilder::Draft draft;
  draft.begin(4096);
  for (const std::int64_t integer : integers) {
    values.emplace_back(integer);
    draft.addSigned(integer);
  }
  for (const std::uint64_t integer : {std::uint64_t{1}, std::numeric_limits<std::uint64_t>::max()}) {
    values.emplace_back(integer);
    draft.addUnsigned(integer);
  }
  for (const double number : {0.1, -0.0, 1.7e12}) {
    values.emplace_back(number);
    draft.addDouble(number);
  }
  for (const std::string& text : texts) {
    values.emplace_back(text);
    draft.addText(text);
  }
  const KeyList keys = keysFor(values.size());
  draft.finish(keys);
  expectTheSame(draft.dictionary(), built(values, keys));
  EXPECT_EQ(draft.at(values.size() - 1), ValueView(texts.back()));
}

TEST(PackedDraft, HoldsNothingOfTheOneBefore) {
  const auto values = everyKind();
  const KeyList keys = keysFor(values.size());
  const KeyList one = keysFor(1);
  PackedBuilder::Draft draft;
  fill(draft, values, keys);
  const Dictionary first = draft.dictionary();
  fill(draft, {7}, one);
  expectTheSame(draft.dictionary(), built({7}, one));
  expectTheSame(first, built(values, keys));
  const KeyList none;
  fill(draft, {}, none);
  EXPECT_TRUE(draft.dictionary().empty());
}

TEST(PackedDraft, GetsEntriesBeforeItsBlockIsMade) {
  const auto values = everyKind();
  const KeyList keys = keysFor(values.size());
  PackedBuilder::Draft draft;
  fill(draft, values, keys);
  const std::array<Entry, 2> entries{{{Key("audiotag"), "PlaybackStart"}, {Key("level"), 3}}};
  const PackedBuilder::Addition addition(keys, entries);
  ASSERT_TRUE(addition.isFor(draft));
  Dictionary expected = built(values, keys);
  for (const Entry& entry : entries) {
    expected.set(entry.key, entry.value);
  }
  expectTheSame(addition.addedTo(draft), expected);
  const KeyList others = keysFor(2);
  fill(draft, {1, 2}, others);
  EXPECT_FALSE(addition.isFor(draft));
}

}  // namespace
}  // namespace tarn::plist
