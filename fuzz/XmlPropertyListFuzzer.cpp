// SPDX-License-Identifier: Apache-2.0
// Bytes as an XML property list: whatever they are, they read as a value or as a fault with its line, and what was read
// is written so that it reads back equal.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "plist/formats/XmlPropertyList.h"
#include "service/vocabulary/DataSerialize.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace tarn;
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  const plist::PropertyListReading reading = plist::readXmlPropertyList(text);
  if (reading.fault) {
    if (reading.value.present() || reading.fault->number == 0 || reading.fault->number > size + 1 ||
        reading.fault->text.empty()) {
      std::abort();
    }
    return 0;
  }
  const auto written = DataSerialize::getPlistBlob(reading.value);
  if (!written || !(plist::readXmlPropertyList(*written).value == reading.value)) {
    std::abort();
  }
  return 0;
}
