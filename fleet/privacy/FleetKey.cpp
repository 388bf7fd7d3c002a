// SPDX-License-Identifier: Apache-2.0
#include "fleet/privacy/FleetKey.h"

#include <sodium.h>

#include <cmath>
#include <cstring>

#include "plist/Hex.h"

namespace tarn::fleet {

namespace {

constexpr std::size_t kDeviceBytes = 16;
constexpr std::size_t kHashBytes = 12;
constexpr double kSecondsPerDay = 86400;
// What a derived key is for: these numbers, and from the last on the epochs.
constexpr std::uint64_t kForDevices = 1;
constexpr std::uint64_t kForSamples = 2;
constexpr std::uint64_t kForEpochs = 1000;
constexpr char kContext[crypto_kdf_CONTEXTBYTES + 1] = "tarnflt1";

static_assert(FleetKey::kBytes == crypto_kdf_KEYBYTES);

template <std::size_t kSize>
std::string keyedHash(const std::array<unsigned char, FleetKey::kBytes>& key, std::string_view value) {
  std::array<unsigned char, kSize> hash{};
  crypto_generichash(hash.data(), hash.size(), reinterpret_cast<const unsigned char*>(value.data()), value.size(),
                     key.data(), key.size());
  return {reinterpret_cast<const char*>(hash.data()), hash.size()};
}

}  // namespace

Result<FleetKey> FleetKey::parse(std::string_view text) {
  Result<FleetKey> key;
  std::size_t size = 0;
  const char* end = nullptr;
  const int failed = sodium_hex2bin(key.value.master_.data(), kBytes, text.data(), text.size(), " \t\r\n", &size, &end);
  if (failed != 0 || size != kBytes || end != text.data() + text.size()) {
    return {{}, Error{0, "must hold a key of 64 hexadecimal digits, and nothing else"}};
  }
  return key;
}

FleetKey FleetKey::random() {
  FleetKey key;
  randombytes_buf(key.master_.data(), key.master_.size());
  return key;
}

FleetKey::Secret FleetKey::derived(std::uint64_t number) const {
  Secret secret{};
  crypto_kdf_derive_from_key(secret.data(), secret.size(), number, kContext, master_.data());
  return secret;
}

std::string FleetKey::deviceOf(std::string_view machineId) const {
  return keyedHash<kDeviceBytes>(derived(kForDevices), machineId);
}

std::string FleetKey::hashOf(std::int64_t epoch, std::string_view value) const {
  std::string text = std::to_string(epoch) + ":";
  plist::appendHex(text, keyedHash<kHashBytes>(derived(kForEpochs + static_cast<std::uint64_t>(epoch)), value));
  return text;
}

bool FleetKey::isInSample(double share, std::string_view session) const {
  if (share >= 1) return true;
  // A generic hash has at least 16 bytes.
  const std::string hash = keyedHash<kDeviceBytes>(derived(kForSamples), session);
  std::uint64_t number = 0;
  std::memcpy(&number, hash.data(), sizeof number);
  return std::ldexp(static_cast<double>(number), -64) < share;
}

std::int64_t epochAt(double seconds, std::int64_t rotateDays) {
  if (rotateDays <= 0 || !(seconds > 0)) return 0;
  return static_cast<std::int64_t>(seconds / kSecondsPerDay) / rotateDays;
}

}  // namespace tarn::fleet
