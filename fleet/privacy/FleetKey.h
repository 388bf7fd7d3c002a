// SPDX-License-Identifier: Apache-2.0
// FleetKey: the secret that a fleet's devices share, and what is made with it: names of devices, hashes of what
// identifies, and which sessions are in a sample. Without it nobody can try out which name a hash stands for.
//
// Threads: any, on a const object.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::fleet {

class FleetKey {
 public:
  static constexpr std::size_t kBytes = 32;

  // Of 64 hexadecimal digits and blanks around them.
  static Result<FleetKey> parse(std::string_view text);
  // One that nobody knows, for a look at what would leave.
  static FleetKey random();

  // The device's name everywhere but on it: 16 bytes. It never changes, so records are known again.
  std::string deviceOf(std::string_view machineId) const;
  // "EPOCH:" and 24 hexadecimal digits. A value has the same hash on all devices of the fleet within an epoch, and
  // nothing tells that it is the same in the next one.
  std::string hashOf(std::int64_t epoch, std::string_view value) const;
  // Whether a session is in a sample of this share, of 0 to 1; always the same for it, and for a greater share
  // whenever it is for a smaller one.
  bool isInSample(double share, std::string_view session) const;

 private:
  using Secret = std::array<unsigned char, kBytes>;

  Secret derived(std::uint64_t number) const;

  Secret master_{};
};

// The epoch at a moment, in epoch seconds; 0 where keys don't change.
std::int64_t epochAt(double seconds, std::int64_t rotateDays);

}  // namespace tarn::fleet
