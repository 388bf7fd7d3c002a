#include "host/log/HostLog.h"

#include <cstdio>
#include <system_error>

namespace tarn::linux_host {

void hostLog(platform::Log& log, const platform::LogCategory& category, platform::LogLevel level,
             std::string_view module, std::string_view text, int line) {
  if (level < log.threshold()) {
    return;
  }
  log.write({category, level, module, line, prefixed(module, text, line)});
}

std::string prefixed(std::string_view module, std::string_view text, int line) {
  char prefix[96];
  const int length =
      std::snprintf(prefix, sizeof prefix, "%25.*s:%-5d ", static_cast<int>(module.size()), module.data(), line);
  std::string whole(prefix, length > 0 ? static_cast<std::size_t>(length) : 0);
  whole += text;
  return whole;
}

std::string errorSuffix(int error) {
  return ": " + std::generic_category().message(error);
}

}  // namespace tarn::linux_host
