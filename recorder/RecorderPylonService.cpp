#include "recorder/RecorderPylonService.h"

#include <string>
#include <string_view>

#include "recorder/Recorder.h"

namespace tarn::recorder {

namespace {

std::string hexOf(std::string_view bytes) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::string hex;
  hex.reserve(2 * bytes.size());
  for (const char byte : bytes) {
    const auto value = static_cast<unsigned char>(byte);
    hex += kDigits[value >> 4U];
    hex += kDigits[value & 0xFU];
  }
  return hex;
}

}  // namespace

void RecorderPylonService::post(std::uint32_t metricIdentifier, const platform::MetricRecord& record) {
  recorder_.record("pylon", std::to_string(metricIdentifier), record.textFields(),
                   {{"wire", hexOf(record.serialized())}}, clock_.epochSeconds());
}

}  // namespace tarn::recorder
