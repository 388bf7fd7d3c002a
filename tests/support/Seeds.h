// SPDX-License-Identifier: Apache-2.0
// Where every random test takes its seeds from, so that a failure can be played again.
//
//   for (const std::uint64_t seed : testSeeds(1)) {
//     SCOPED_TRACE(seedNote(seed));
//     std::mt19937 random(seed);
//
// A fixed seed keeps what a run covers comparable, a fresh one covers more from run to run. Everything that a round
// depends on is made inside the loop: a round by itself must do what it did among others.
#pragma once

#include <charconv>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <random>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace tarn::testing {

inline constexpr const char* kSeedVariable = "TARN_TEST_SEED";

// For the trace of a failure: which seed it was and how to repeat it.
inline std::string seedNote(std::uint64_t seed) {
  const std::string number = std::to_string(seed);
  return "seed " + number + ", to repeat: " + kSeedVariable + "=" + number;
}

// The one in TARN_TEST_SEED alone when that is set, or else `fixedSeed` and a fresh one; each is printed. A variable
// that holds no number throws: going on with other seeds would look like a repetition.
inline std::vector<std::uint64_t> testSeeds(std::uint64_t fixedSeed) {
  std::vector<std::uint64_t> seeds;
  if (const char* const asked = std::getenv(kSeedVariable)) {
    const std::string_view text(asked);
    std::uint64_t seed = 0;
    const auto [end, error] = std::from_chars(text.begin(), text.end(), seed);
    if (error != std::errc() || end != text.end()) {
      throw std::invalid_argument(std::string(kSeedVariable) + " holds no seed: " + asked);
    }
    seeds = {seed};
  } else {
    seeds = {fixedSeed, std::random_device{}()};
  }
  for (const std::uint64_t seed : seeds) {
    std::printf("%s\n", seedNote(seed).c_str());
  }
  std::fflush(stdout);  // a crash tells its seed too
  return seeds;
}

}  // namespace tarn::testing
