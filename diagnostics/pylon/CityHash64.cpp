// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/pylon/CityHash64.h"

#include <bit>
#include <cstddef>
#include <utility>

namespace pylonmetrics {

namespace {

constexpr std::uint64_t kSeed0 = 0xc3a5c85c97cb3127;
constexpr std::uint64_t kSeed1 = 0xb492b66fbe98f273;
constexpr std::uint64_t kSeed2 = 0x9ae16a3b2f90404f;
constexpr std::uint64_t kMultiplier = 0x9ddfea08eb382d69;

// Long inputs are taken in blocks of this size.
constexpr std::size_t kBlockBytes = 64;

using Pair = std::pair<std::uint64_t, std::uint64_t>;

// Little-endian numbers out of the bytes; the compilers make one load of each.
std::uint64_t byteAt(std::string_view bytes, std::size_t at) {
  return static_cast<unsigned char>(bytes[at]);
}

std::uint64_t load32(std::string_view bytes, std::size_t at) {
  return byteAt(bytes, at) | byteAt(bytes, at + 1) << 8U | byteAt(bytes, at + 2) << 16U | byteAt(bytes, at + 3) << 24U;
}

std::uint64_t load64(std::string_view bytes, std::size_t at) {
  return load32(bytes, at) | load32(bytes, at + 4) << 32U;
}

std::uint64_t swapBytes(std::uint64_t value) {
  value = (value & 0x00ff00ff00ff00ffU) << 8U | (value >> 8U & 0x00ff00ff00ff00ffU);
  value = (value & 0x0000ffff0000ffffU) << 16U | (value >> 16U & 0x0000ffff0000ffffU);
  return std::rotr(value, 32);
}

std::uint64_t shiftMix(std::uint64_t value) {
  return value ^ value >> 47U;
}

std::uint64_t mix(std::uint64_t low, std::uint64_t high, std::uint64_t multiplier = kMultiplier) {
  const std::uint64_t first = shiftMix((low ^ high) * multiplier);
  return shiftMix((high ^ first) * multiplier) * multiplier;
}

std::uint64_t multiplierFor(std::size_t length) {
  return kSeed2 + length * 2;
}

std::uint64_t hashUpTo16(std::string_view bytes) {
  const std::size_t length = bytes.size();
  const std::uint64_t multiplier = multiplierFor(length);
  if (length >= 8) {
    const std::uint64_t a = load64(bytes, 0) + kSeed2;
    const std::uint64_t b = load64(bytes, length - 8);
    const std::uint64_t c = std::rotr(b, 37) * multiplier + a;
    const std::uint64_t d = (std::rotr(a, 25) + b) * multiplier;
    return mix(c, d, multiplier);
  }
  if (length >= 4) return mix(length + (load32(bytes, 0) << 3U), load32(bytes, length - 4), multiplier);
  if (length > 0) {
    const std::uint64_t y = byteAt(bytes, 0) + (byteAt(bytes, length / 2) << 8U);
    const std::uint64_t z = length + (byteAt(bytes, length - 1) << 2U);
    return shiftMix(y * kSeed2 ^ z * kSeed0) * kSeed2;
  }
  return kSeed2;
}

std::uint64_t hash17To32(std::string_view bytes) {
  const std::size_t length = bytes.size();
  const std::uint64_t multiplier = multiplierFor(length);
  const std::uint64_t a = load64(bytes, 0) * kSeed1;
  const std::uint64_t b = load64(bytes, 8);
  const std::uint64_t c = load64(bytes, length - 8) * multiplier;
  const std::uint64_t d = load64(bytes, length - 16) * kSeed2;
  return mix(std::rotr(a + b, 43) + std::rotr(c, 30) + d, a + std::rotr(b + kSeed2, 18) + c, multiplier);
}

std::uint64_t hash33To64(std::string_view bytes) {
  const std::size_t length = bytes.size();
  const std::uint64_t multiplier = multiplierFor(length);
  const std::uint64_t a = load64(bytes, 0) * kSeed2;
  const std::uint64_t b = load64(bytes, 8);
  const std::uint64_t c = load64(bytes, length - 24);
  const std::uint64_t d = load64(bytes, length - 32);
  const std::uint64_t e = load64(bytes, 16) * kSeed2;
  const std::uint64_t f = load64(bytes, 24) * 9;
  const std::uint64_t g = load64(bytes, length - 8);
  const std::uint64_t h = load64(bytes, length - 16) * multiplier;
  const std::uint64_t u = std::rotr(a + g, 43) + (std::rotr(b, 30) + c) * 9;
  const std::uint64_t v = ((a + g) ^ d) + f + 1;
  const std::uint64_t w = swapBytes((u + v) * multiplier) + h;
  const std::uint64_t x = std::rotr(e + f, 42) + c;
  const std::uint64_t y = (swapBytes((v + w) * multiplier) + g) * multiplier;
  const std::uint64_t z = e + f + c;
  const std::uint64_t first = swapBytes((x + z) * multiplier + y) + b;
  const std::uint64_t second = shiftMix((z + first) * multiplier + d + h) * multiplier;
  return second + x;
}

// Folds the 32 bytes from `at` on into a running pair.
Pair fold32(std::string_view bytes, std::size_t at, std::uint64_t first, std::uint64_t second) {
  const std::uint64_t last = load64(bytes, at + 24);
  first += load64(bytes, at);
  second = std::rotr(second + first + last, 21);
  const std::uint64_t start = first;
  first += load64(bytes, at + 8) + load64(bytes, at + 16);
  second += std::rotr(first, 44);
  return {first + last, second + start};
}

std::uint64_t hashBeyond64(std::string_view bytes) {
  const std::size_t length = bytes.size();
  // 56 bytes of state, begun with the last block; then whole blocks from the front, so that the two may overlap.
  std::uint64_t x = load64(bytes, length - 40);
  std::uint64_t y = load64(bytes, length - 16) + load64(bytes, length - 56);
  std::uint64_t z = mix(load64(bytes, length - 48) + length, load64(bytes, length - 24));
  Pair v = fold32(bytes, length - 64, length, z);
  Pair w = fold32(bytes, length - 32, y + kSeed1, x);
  x = x * kSeed1 + load64(bytes, 0);
  const std::size_t end = (length - 1) / kBlockBytes * kBlockBytes;
  for (std::size_t at = 0; at < end; at += kBlockBytes) {
    x = std::rotr(x + y + v.first + load64(bytes, at + 8), 37) * kSeed1;
    y = std::rotr(y + v.second + load64(bytes, at + 48), 42) * kSeed1;
    x ^= w.second;
    y += v.first + load64(bytes, at + 40);
    z = std::rotr(z + w.first, 33) * kSeed1;
    v = fold32(bytes, at, v.second * kSeed1, x + w.first);
    w = fold32(bytes, at + 32, z + w.second, y + load64(bytes, at + 16));
    std::swap(z, x);
  }
  return mix(mix(v.first, w.first) + shiftMix(y) * kSeed1 + z, mix(v.second, w.second) + x);
}

}  // namespace

std::uint64_t cityHash64(std::string_view bytes) noexcept {
  if (bytes.size() <= 16) return hashUpTo16(bytes);
  if (bytes.size() <= 32) return hash17To32(bytes);
  return bytes.size() <= kBlockBytes ? hash33To64(bytes) : hashBeyond64(bytes);
}

}  // namespace pylonmetrics
