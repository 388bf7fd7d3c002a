#include "wire/Utf8.h"

#include <gtest/gtest.h>

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
