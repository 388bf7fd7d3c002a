// SPDX-License-Identifier: Apache-2.0
// What the posting library puts into a record, and which texts it takes: at every length where the way of copying or of
// looking changes.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "clients/c/src/Utf8.h"
#include "clients/ring/RingProducer.h"
#include "wire/Utf8.h"

namespace tarn {
namespace {

constexpr std::byte kBefore{0xEE};
constexpr std::size_t kLongest = 300;

bool isTaken(std::string_view text) {
  return reporting::isUtf8(text.data(), text.size());
}

TEST(RecordContent, PutsTheBytesThenZerosAndTouchesNothingElse) {
  std::array<char, kLongest> bytes{};
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    bytes[i] = static_cast<char>(i % 250 + 1);
  }
  for (std::uint32_t length = 0; length <= kLongest; ++length) {
    std::vector<std::byte> memory(8 + tarnring_padded(length) + 8, kBefore);
    ring::RecordContent<ring::SharedWords> content(memory.data() + 8);
    content.put(bytes.data(), length);
    content.put(~std::uint64_t{0});

    std::vector<std::byte> expected(8, kBefore);
    const auto* const from = reinterpret_cast<const std::byte*>(bytes.data());
    expected.insert(expected.end(), from, from + length);
    expected.resize(8 + tarnring_padded(length), std::byte{0});
    expected.resize(expected.size() + 8, std::byte{0xFF});
    EXPECT_EQ(memory, expected) << length;
  }
}

TEST(PostedText, IsTakenWhenEveryByteIsAscii) {
  for (std::size_t length = 0; length <= 40; ++length) {
    EXPECT_TRUE(isTaken(std::string(length, '\x7f'))) << length;
    EXPECT_TRUE(isTaken(std::string(length, '\0'))) << length;
  }
}

TEST(PostedText, IsRefusedForOneWrongByteWhereverItStands) {
  for (std::size_t length = 1; length <= 40; ++length) {
    for (std::size_t at = 0; at < length; ++at) {
      for (const char wrong : {'\x80', '\xbf', '\xc0', '\xc2', '\xe1', '\xf1', '\xff'}) {
        std::string text(length, 'a');
        text[at] = wrong;
        EXPECT_FALSE(isTaken(text)) << length << ' ' << at << ' ' << static_cast<int>(wrong);
      }
    }
  }
}

// Characters and pieces of characters in every row of four, between ASCII of every length up to a word.
TEST(PostedText, IsJudgedAsTheServiceJudgesIt) {
  constexpr std::array<std::string_view, 14> kPieces{
      "",     "a",        "\xc2\x80",     "\xdf\xbf",     "\xe0\xa0\x80", "\xed\x9f\xbf",     "\xf4\x8f\xbf\xbf",
      "\xc2", "\xe1\x80", "\xf1\x80\x80", "\xed\xa0\x80", "\xe0\x9f\xbf", "\xf4\x90\x80\x80", "\x80"};
  std::size_t good = 0;
  std::size_t bad = 0;
  for (std::size_t before = 0; before <= 9; ++before) {
    for (const std::string_view first : kPieces) {
      for (const std::string_view second : kPieces) {
        for (std::size_t after = 0; after <= 9; ++after) {
          std::string text(before, 'x');
          text.append(first).append("yz").append(second).append(after, 'x');
          const bool taken = isTaken(text);
          ++(taken ? good : bad);
          ASSERT_EQ(taken, wire::isUtf8(text)) << before << ' ' << after;
        }
      }
    }
  }
  EXPECT_EQ(good, 10U * 7 * 7 * 10);
  EXPECT_EQ(bad, 10U * (14 * 14 - 7 * 7) * 10);
}

}  // namespace
}  // namespace tarn
