// SPDX-License-Identifier: Apache-2.0
// The Protocol Buffers wire format, as far as metric records need it.
//
// A field is a tag and a value. The tag is a varint: the field's number times 8, plus how its value is laid out. A
// varint has seven bits a byte, the lowest first; every byte but the last has its highest bit set:
//
//   08 96 01            field 1, varint, 150
//   22 02 68 69         field 4, length-delimited, "hi"
#pragma once

#include <cstddef>
#include <cstdint>

namespace pylonmetrics {

// How a value is laid out; 6 and 7 mean nothing.
enum class WireType : std::uint8_t {
  Varint = 0,
  Fixed64 = 1,          // eight bytes
  LengthDelimited = 2,  // a varint, then so many bytes
  GroupStart = 3,       // fields up to the group's end
  GroupEnd = 4,         // no value
  Fixed32 = 5,          // four bytes
};

// What 64 bits need at seven a byte.
inline constexpr std::size_t kLongestVarint = 10;
// How many bits of a varint's byte are the number's, and how many of a tag tell the layout.
inline constexpr unsigned kVarintBits = 7;
inline constexpr unsigned kWireTypeBits = 3;
inline constexpr unsigned kWireTypeMask = (1U << kWireTypeBits) - 1;

}  // namespace pylonmetrics
