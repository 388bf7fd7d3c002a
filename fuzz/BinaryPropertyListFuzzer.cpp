// SPDX-License-Identifier: Apache-2.0
// Bytes as a binary property list: whatever they are, they read as a value within the bounds or as a fault with its
// place.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "plist/formats/BinaryPropertyList.h"

namespace {

using tarn::plist::Dictionary;
using tarn::plist::Kind;
using tarn::plist::ValueView;

// How deep the value is nested; `count` grows by the values in it.
std::size_t nesting(const ValueView& value, std::size_t& count) {
  ++count;
  std::size_t deepest = 0;
  if (value.kind() == Kind::Array) {
    for (const ValueView& item : value.array()) {
      deepest = std::max(deepest, nesting(item, count));
    }
    return deepest + 1;
  }
  if (value.kind() == Kind::Dictionary) {
    for (const Dictionary::Entry& entry : value.dictionary()) {
      deepest = std::max(deepest, nesting(entry.value, count));
    }
    return deepest + 1;
  }
  return 0;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace tarn::plist;
  const PropertyListReading reading =
      readBinaryPropertyList(std::string_view(reinterpret_cast<const char*>(data), size));
  std::size_t count = 0;
  const bool isWrong =
      reading.fault ? reading.value.present() || reading.fault->number > size || reading.fault->text.empty()
                    : !reading.value.present() || nesting(reading.value, count) > kMaximumPropertyListNesting + 1 ||
                          count > 2 * kMaximumPropertyListValues;
  if (isWrong) {
    std::abort();
  }
  return 0;
}
