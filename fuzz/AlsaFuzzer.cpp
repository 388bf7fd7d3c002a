// SPDX-License-Identifier: Apache-2.0
// Bytes as the kernel's texts on a PCM substream: a state and a direction that are known, names that are printable.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "host/drivers/AlsaText.h"

namespace {

void demand(bool holds) {
  if (!holds) {
    std::abort();
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace tarn::linux_host;
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  if (const auto status = parseAlsaStatus(text)) {
    demand(status->state < kAlsaStateCount);
    demand(status->triggerNanoseconds.value_or(1) > 0 && status->nowNanoseconds.value_or(1) > 0);
  }
  if (const auto info = parseAlsaInfo(text)) {
    demand(info->id == alsaName(info->id));
  }
  for (const char character : alsaName(text)) {
    demand(character >= ' ' && character <= '~');
  }
  return 0;
}
