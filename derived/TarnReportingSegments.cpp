// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSegments.h"

#include <array>

#include "service/vocabulary/TarnReportingUtility.h"

namespace tarn {

namespace {

const plist::Key kMessageCount("msgcnt");

}  // namespace

const plist::Key kTarnReportingMessageIndex("msgidx");

bool TarnReportingNumbersDiffer(const plist::ValueView& first, const plist::ValueView& second) {
  if (first.isNumber() && second.isNumber()) return !(first == second);
  return first.asDouble() != second.asDouble();
}

bool TarnReportingTextsDiffer(const plist::ValueView& first, const plist::ValueView& second) {
  if (first.isText() && second.isText()) return first.text() != second.text();
  return first.asText() != second.asText();
}

std::span<const double> TarnReportingUtilityBucketNumberToStringTimes() noexcept {
  static constexpr std::array<double, 11> kBounds{0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000};
  return kBounds;
}

std::span<const double> TarnReportingUtilityBucketNumberToStringVolumes() noexcept {
  static constexpr std::size_t kSteps = 16;
  static constexpr auto kBounds = [] {
    std::array<double, kSteps + 1> bounds{};
    for (std::size_t i = 0; i < bounds.size(); ++i) {
      bounds[i] = static_cast<double>(i) / kSteps;
    }
    return bounds;
  }();
  return kBounds;
}

std::string TarnReportingSegmentLengthLabel(double seconds) {
  return TarnReportingUtilityBucketNumberToString(seconds, TarnReportingUtilityBucketNumberToStringTimes(), 0)
      .value_or(std::string());
}

std::string TarnReportingVolumeLabel(double volume) {
  return TarnReportingUtilityBucketNumberToString(volume, TarnReportingUtilityBucketNumberToStringVolumes(), 4)
      .value_or(std::string());
}

void TarnReportingNumberMessages(const TarnReportingSessionMessageList& derived) {
  for (std::size_t index = 0; index < derived.size(); ++index) {
    derived.change(index, [&](TarnReportingSessionMessage& message) {
      message.mutableMessage().set(kMessageCount, derived.size());
    });
  }
}

}  // namespace tarn
