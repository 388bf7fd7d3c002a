// SPDX-License-Identifier: Apache-2.0
#include "host/log/PrefixedLog.h"

#include <new>

#include "platform/LogPrefix.h"

namespace tarn::linux_host {

void logPrefixed(platform::Log& log, const platform::LogCategory& category, platform::LogLevel level,
                 std::string_view module, std::string_view text, int line) noexcept {
  if (level < log.threshold()) return;
  try {
    log.write({category, level, module, line, prefixed(module, text, line)});
  } catch (const std::bad_alloc&) {
    log.write({category, level, module, line, platform::kNoMemoryForLine});
  }
}

std::string prefixed(std::string_view module, std::string_view text, int line) {
  std::string whole;
  platform::appendLogPrefix(whole, module, line);
  whole += text;
  return whole;
}

}  // namespace tarn::linux_host
