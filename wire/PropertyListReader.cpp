// SPDX-License-Identifier: Apache-2.0
#include "wire/PropertyListReader.h"

namespace tarn::wire {

float floatFromHalf(std::uint16_t half) noexcept {
  const std::uint32_t sign = (half & 0x8000U) << 16U;
  const std::uint32_t exponent = (half >> 10U) & 0x1FU;
  const std::uint32_t fraction = half & 0x3FFU;
  if (exponent == 0) {  // zero and subnormal: the fraction counts 2^-24
    const float magnitude = static_cast<float>(fraction) * 0x1p-24F;
    return sign != 0 ? -magnitude : magnitude;
  }
  // The exponent's bias grows from 15 to 127; infinities and not-a-numbers keep all ones.
  const std::uint32_t wide = exponent == 0x1F ? 0xFFU : exponent + 112;
  return std::bit_cast<float>(sign | wide << 23U | fraction << 13U);
}

}  // namespace tarn::wire
