// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/RowHash.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace tarn::recorder {
namespace {

std::uint64_t hashOf(std::string_view text) {
  RowHash hash;
  hash.add(text);
  return hash.value();
}

// Files that were written long ago hold them.
TEST(RowHash, NeverChanges) {
  EXPECT_EQ(hashOf(""), 0xF7E27BEADF4196A5U);
  EXPECT_EQ(hashOf("abc"), 0x7132498FDE0DD033U);
  EXPECT_EQ(hashOf("0123456789abcdef"), 0x722EF9B8CFBA15ADU);
  EXPECT_EQ(hashOf("a whole word and a rest, \xff"), 0xFD006177599186DCU);
}

TEST(RowHash, ATextIsItsSizeAndItsBytesByEights) {
  std::string text;
  for (int size = 0; size < 40; ++size) {
    RowHash expected;
    expected.add(std::uint64_t{text.size()});
    for (std::size_t at = 0; at < text.size(); at += 8) {
      std::uint64_t word = 0;
      for (std::size_t i = at; i < text.size() && i < at + 8; ++i) {
        word |= std::uint64_t{static_cast<unsigned char>(text[i])} << (8 * (i - at));
      }
      expected.add(word);
    }
    EXPECT_EQ(hashOf(text), expected.value()) << size;
    text.push_back(static_cast<char>(0x90 + 5 * size));
  }
}

}  // namespace
}  // namespace tarn::recorder
