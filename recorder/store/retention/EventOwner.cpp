// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/EventOwner.h"

namespace tarn::recorder {

namespace {

// The event in which the mirror joins all values of a session: of no category and no type.
bool isMirrorsSummary(std::string_view detail) noexcept {
  return detail.find("\"category\":65535") != std::string_view::npos &&
         detail.find("\"type\":65535") != std::string_view::npos;
}

}  // namespace

EventSort sortOf(std::string_view backend, std::string_view name, std::string_view detail) noexcept {
  bool tellsOfOneMessage = false;
  if (backend == "tally") {
    tellsOfOneMessage = !name.ends_with(".Summary") && name.find(".Flume.") == std::string_view::npos;
  } else if (backend == "rtc") {
    tellsOfOneMessage = name == "sendMessage" && !isMirrorsSummary(detail);
  } else {
    tellsOfOneMessage = backend == "wattlog" || backend == "pylon";
  }
  return tellsOfOneMessage ? EventSort::Message : EventSort::Summary;
}

}  // namespace tarn::recorder
