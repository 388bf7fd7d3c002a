// SPDX-License-Identifier: Apache-2.0
// Bytes as a configuration file: they give a configuration within its ranges or one line that names the file.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "host/settings/HostConfiguration.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace tarn::linux_host;
  const auto read = parseConfiguration({reinterpret_cast<const char*>(data), size}, "c.toml");
  if (read.failed()) {
    if (!read.error->text.starts_with("c.toml:") || read.error->text.find('\n') != std::string::npos) {
      std::abort();
    }
    return 0;
  }
  const HostConfiguration& host = read.value;
  const bool inRange = host.rtc.startDelay.count() >= 0 && host.rtc.startDelay.count() <= 3'600'000 &&
                       host.recorder.maxMegabytes >= 1 && host.recorder.maxMegabytes <= 1048576 &&
                       host.recorder.maxAgeDays >= 1 && host.recorder.maxAgeDays <= 36500 &&
                       host.limits.maxFrameBytes >= 64 && host.limits.maxFrameBytes <= 67108864;
  if (!inRange) {
    std::abort();
  }
  return 0;
}
