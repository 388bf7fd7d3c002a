// SPDX-License-Identifier: Apache-2.0
// Bytes as a defaults file: whatever they are, they read as a value or as a fault with its place, and what was read is
// written so that it reads back equal.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "host/system/JsonValues.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace tarn::linux_host;
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  const JsonReading reading = readJson(text, kMaximumJsonNesting, JsonNull::Absent);
  if (reading.fault) {
    if (reading.value.present() || reading.fault->line == 0 || reading.fault->column == 0 ||
        reading.fault->column > size + 1 || reading.fault->text.empty()) {
      std::abort();
    }
    return 0;
  }
  for (const JsonLayout layout : {JsonLayout::OneLine, JsonLayout::Indented}) {
    const std::optional<std::string> written = jsonText(reading.value, layout);
    if (!written || readJson(*written).value != reading.value) {
      std::abort();
    }
  }
  return 0;
}
