// SPDX-License-Identifier: Apache-2.0
#include "wire/Utf8.h"

#include <gtest/gtest.h>

#include <set>
#include <string>

#include "tests/wire/Bytes.h"

namespace tarn::wire {
namespace {

using testing::fromHex;

// The first and last of each length and on both sides of the surrogates.
constexpr std::string_view kGood[] = {"",       "00",     "7f",     "c280",     "dfbf",    "e0a080",
                                      "ed9fbf", "ee8080", "efbfbf", "f0908080", "f48fbfbf"};
constexpr std::string_view kBad[] = {
    "80",       "bf",       "c080",     "c1bf",     "c2",     "c27f",           // stray, overlong, cut off
    "e09fbf",   "eda080",   "edbfbf",   "e0a0",     "e1807f",                   // overlong, surrogates
    "f08fbfbf", "f4908080", "f5808080", "f8888080", "ff",     "fe",   "f09080"  // too large, no such lead
};

TEST(Utf8, AcceptsEveryBoundaryCharacterWhereverItStands) {
  for (const std::string_view hex : kGood) {
    for (std::size_t before = 0; before <= 17; ++before) {
      EXPECT_TRUE(isUtf8(std::string(before, 'a') + fromHex(hex) + "bc")) << hex << " behind " << before;
    }
  }
}

// The characters of Unicode, encoded as their definition says: what may stand at the front of a text.
std::set<std::string> everyCharacter() {
  const auto rest = [](unsigned bits) { return static_cast<char>(0x80U | (bits & 0x3FU)); };
  std::set<std::string> characters;
  for (unsigned point = 0; point <= 0x10FFFF; ++point) {
    if (point >= 0xD800 && point <= 0xDFFF) continue;
    if (point < 0x80) {
      characters.insert({static_cast<char>(point)});
    } else if (point < 0x800) {
      characters.insert({static_cast<char>(0xC0U | point >> 6U), rest(point)});
    } else if (point < 0x10000) {
      characters.insert({static_cast<char>(0xE0U | point >> 12U), rest(point >> 6U), rest(point)});
    } else {
      characters.insert({static_cast<char>(0xF0U | point >> 18U), rest(point >> 12U), rest(point >> 6U), rest(point)});
    }
  }
  return characters;
}

TEST(Utf8, KnowsTheLengthOfEveryCharacterAndOfNothingElse) {
  const std::set<std::string> characters = everyCharacter();
  for (unsigned first = 0; first < 256; ++first) {
    for (unsigned second = 0; second < 256; ++second) {
      for (const char third : {'\x80', '\xBF', '\x7F'}) {
        const std::string text{static_cast<char>(first), static_cast<char>(second), third, '\xBF'};
        std::size_t expected = 0;
        for (std::size_t length = 1; length <= text.size(); ++length) {
          if (characters.contains(text.substr(0, length))) {
            expected = length;
          }
        }
        ASSERT_EQ(utf8CharacterLength(text), expected) << first << ' ' << second << ' ' << int{third};
      }
    }
  }
}

TEST(Utf8, RefusesOverlongFormsSurrogatesTooLargeAndCutOffOnes) {
  for (const std::string_view hex : kBad) {
    for (std::size_t before = 0; before <= 17; ++before) {
      EXPECT_FALSE(isUtf8(std::string(before, 'a') + fromHex(hex))) << hex << " behind " << before;
      EXPECT_FALSE(isUtf8(std::string(before, 'a') + fromHex(hex) + std::string(9, 'z'))) << hex;
    }
  }
}

TEST(Utf8, EverySingleByteBeyondAsciiIsFoundAtEveryPlace) {
  for (std::size_t size = 1; size <= 40; ++size) {
    for (std::size_t place = 0; place < size; ++place) {
      std::string text(size, 'a');
      EXPECT_TRUE(isAscii(text));
      text[place] = '\x80';
      EXPECT_FALSE(isAscii(text)) << place << " of " << size;
    }
  }
}

TEST(Utf8, NothingBesideAShortTextIsLookedAt) {
  const std::string around =
      "\x80\x80\x80\x80\x80\x80\x80\x80" + std::string(9, 'a') + "\x80\x80\x80\x80\x80\x80\x80\x80";
  for (std::size_t size = 0; size <= 9; ++size) {
    EXPECT_TRUE(isAscii(std::string_view(around).substr(8, size))) << size;
    EXPECT_TRUE(isAscii(std::string_view(around).substr(17 - size, size))) << size;
  }
}

TEST(Utf8, MendingReplacesWrongBytesOnly) {
  std::string mended;
  appendMendedUtf8(mended, "a\xC3\xA4" + fromHex("ff") + "b" + fromHex("e280"));
  EXPECT_EQ(mended,
            "a\xC3\xA4\xEF\xBF\xBD"
            "b\xEF\xBF\xBD\xEF\xBF\xBD");
  EXPECT_TRUE(isUtf8(mended));
}

}  // namespace
}  // namespace tarn::wire
