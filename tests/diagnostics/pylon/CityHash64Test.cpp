// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/pylon/CityHash64.h"

#include <gtest/gtest.h>

#include <set>
#include <string>
#include <utility>
#include <vector>

namespace pylonmetrics {
namespace {

std::string patternOf(std::size_t length) {
  std::string bytes;
  for (std::size_t i = 0; i < length; ++i) {
    bytes += static_cast<char>(static_cast<unsigned char>(i * 37 + length * 11 + 5));
  }
  return bytes;
}

// Made with the same hash of a general-purpose library, Abseil's internal one (Debian's libabsl20220623), which is this
// second published form. Other libraries' string hash, such as libc++'s, is the first form: a fifth constant, and other
// results for everything but the empty string.
TEST(CityHash64, EveryLengthClassGivesThePublishedResult) {
  const std::vector<std::pair<std::size_t, std::uint64_t>> expected{
      {0, 0x9ae16a3b2f90404f},   {1, 0x094935fd3040ca74},   {2, 0x9485c77eba8be34a},    {3, 0x55c0debf037bbfe6},
      {4, 0xccb552f7a639ca75},   {5, 0xbcf81a0443963e38},   {7, 0xddd692232259cb9c},    {8, 0x30cb579db4461cad},
      {9, 0xaa8af4d4e353e09a},   {12, 0xe1afee156a26f9c1},  {15, 0xf96342cb8adf51e0},   {16, 0xb140b1dd3d865b19},
      {17, 0x6b3df6e1db900c4c},  {24, 0xf654be7a3097c7dc},  {31, 0xd3bc8aa04fb8daa3},   {32, 0x6bd7c0da67cb586a},
      {33, 0x041cde31e8f03b3e},  {48, 0x91d621322b38c775},  {63, 0x786560e3393cdf03},   {64, 0x72baf1cad9370ad2},
      {65, 0x11a8d397d15f7f59},  {100, 0x678c6a2234319ee1}, {127, 0x14ff1c4611bfb8ef},  {128, 0x912eac5202d2c7c5},
      {129, 0x8b28ce6d79d1e5c6}, {191, 0xe99ea59271ed6d33}, {192, 0xd9330f4799746e6e},  {193, 0x05b486f8202a17a1},
      {256, 0x68b4ef07b0af279a}, {300, 0xf4480d5b4984f4a8}, {1000, 0x885e0c189c176d5c},
  };
  for (const auto& [length, hash] : expected) {
    EXPECT_EQ(cityHash64(patternOf(length)), hash) << length << " bytes";
  }
}

TEST(CityHash64, WordsGiveThePublishedResult) {
  EXPECT_EQ(cityHash64("a"), 0xb3454265b6df75e3);
  EXPECT_EQ(cityHash64("glitch"), 0x24d85d791a6b8e3b);
  EXPECT_EQ(cityHash64("dropout"), 0x203dcc930ed1ce2a);
  EXPECT_EQ(cityHash64("org.example.music"), 0xead0077430fe03c9);
}

TEST(CityHash64, ReadsNothingOutsideItsBytes) {
  // A sanitizer sees reads beyond the ends; without one, other surroundings must not change the result.
  for (std::size_t length = 0; length <= 200; ++length) {
    const std::string bytes = patternOf(length);
    const std::string low = std::string(80, '\0') + bytes + std::string(80, '\0');
    const std::string high = std::string(80, '\xff') + bytes + std::string(80, '\xff');
    EXPECT_EQ(cityHash64(std::string_view(low).substr(80, length)), cityHash64(bytes)) << length;
    EXPECT_EQ(cityHash64(std::string_view(high).substr(80, length)), cityHash64(bytes)) << length;
  }
}

TEST(CityHash64, EveryByteCounts) {
  for (std::size_t length = 1; length <= 200; ++length) {
    std::string bytes = patternOf(length);
    std::set<std::uint64_t> results{cityHash64(bytes)};
    for (char& byte : bytes) {
      byte = static_cast<char>(byte ^ 0x40);
      results.insert(cityHash64(bytes));
      byte = static_cast<char>(byte ^ 0x40);
    }
    EXPECT_EQ(results.size(), length + 1) << length;
  }
}

}  // namespace
}  // namespace pylonmetrics
