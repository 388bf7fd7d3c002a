// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingUtility.h"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cmath>
#include <limits>
#include <mutex>

#include "platform/Clock.h"
#include "platform/Condition.h"
#include "platform/DeviceProperties.h"
#include "platform/Facilities.h"
#include "platform/FileSystem.h"
#include "platform/WorkQueue.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn {

namespace {

constexpr std::string_view kModule = "TarnReportingUtility";
constexpr std::string_view kServerQueueName = "sys.oxbow.tarnkit.reporting.server";

// Rounds to the nearest whole number, held to the range of 32 bits.
std::int32_t roundedToInt32(double value) {
  const double rounded = std::round(value);
  if (std::isnan(rounded)) return 0;
  return static_cast<std::int32_t>(std::clamp(rounded, double{std::numeric_limits<std::int32_t>::min()},
                                              double{std::numeric_limits<std::int32_t>::max()}));
}

// In single precision: whoever reads "processuptime_ms" has always got the rounding of it.
std::int32_t processorMilliseconds(std::int64_t ticks) {
  constexpr float kTicksPerSecond = 1'000'000.0F;
  const float seconds = static_cast<float>(ticks) / kTicksPerSecond;
  return roundedToInt32(static_cast<double>(seconds * 1000.0F));
}

// The decimal digits of a finite number that is not negative, as "whole.fraction" without an exponent: the shortest
// that read back the same.
std::string plainDecimal(double value) {
  std::string digits(400, '\0');  // the smallest numbers have 324 places before their digits begin
  const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), value, std::chars_format::fixed).ptr;
  digits.resize(static_cast<std::size_t>(end - digits.data()));
  return digits;
}

// Adds one to the last digit of a decimal number, carrying as far as it goes.
void incrementLastDigit(std::string& digits) {
  for (std::size_t at = digits.size(); at-- > 0;) {
    if (digits[at] == '.') continue;
    if (digits[at] != '9') {
      ++digits[at];
      return;
    }
    digits[at] = '0';
  }
  digits.insert(digits.begin(), '1');
}

// Cuts a decimal number to `places` decimals as number formatters do: on its decimal digits, halves going to the even
// neighbour.
void roundDecimals(std::string& digits, std::size_t places) {
  const std::size_t point = digits.find('.');
  const std::size_t keep = places == 0 ? point : point + 1 + places;
  if (point == std::string::npos || keep >= digits.size()) return;
  const std::string dropped = digits.substr(places == 0 ? point + 1 : keep);
  digits.resize(keep);
  const bool isHalf = dropped == "5";             // the shortest digits end in no zeros
  const bool lastIsOdd = digits.back() % 2 == 1;  // as its character is
  if (isHalf ? lastIsOdd : dropped[0] >= '5') {
    incrementLastDigit(digits);
  }
}

// A number with at most `most` decimals and at least `least`, without grouping.
std::string formatDecimal(double value, std::size_t least, std::size_t most) {
  if (std::isnan(value)) return "NaN";
  std::string text = std::signbit(value) ? "-" : "";
  if (std::isinf(value)) return text + "\u221E";
  std::string digits = plainDecimal(std::abs(value));
  roundDecimals(digits, most);
  std::size_t point = digits.find('.');
  if (point == std::string::npos) {
    point = digits.size();
    digits.push_back('.');
  }
  const std::size_t lastNeeded = digits.find_last_not_of('0');
  digits.resize(std::max(lastNeeded, point + least) + 1, '0');
  if (digits.back() == '.') {
    digits.pop_back();
  }
  return text + digits;
}

}  // namespace

bool TarnReportingUtilityWait(platform::Condition& condition, double timeoutSeconds, const bool& flag,
                              std::string_view waitingText, std::string_view timeoutText,
                              const platform::LogCategory& logCategory) {
  const MutexLock lock(condition);
  while (!flag) {
    TarnReportingLog(logCategory, LogLevel::Info, kModule, "%@", waitingText);
    if (!condition.waitFor(std::chrono::duration<double>(timeoutSeconds))) {
      TarnReportingLog(logCategory, LogLevel::Error, kModule, "%@", timeoutText);
      return false;
    }
    TarnReportingLog(logCategory, LogLevel::Info, kModule, "continuing");
  }
  return true;
}

bool TarnReportingUtilityWait(platform::Condition& condition, std::chrono::nanoseconds timeout, const bool& flag) {
  const platform::Clock& clock = TarnReportingFacilities().clock;
  const auto deadline = clock.monotonic() + timeout;
  const MutexLock lock(condition);
  for (auto left = timeout; !flag && left > std::chrono::nanoseconds::zero(); left = deadline - clock.monotonic()) {
    if (!condition.waitFor(left)) break;
  }
  return flag;
}

void TarnReportingUtilitySignal(platform::Condition& condition, bool& flag) {
  const MutexLock lock(condition);
  flag = true;
  condition.signal();
}

bool TarnReportingUtilityIsInternalBuild() {
  ProcessState& process = ProcessState::current();
  std::call_once(process.internalBuildOnce, [&process] {
    process.internalBuild = process.facilities.deviceProperties.boolean("InternalBuild").value_or(false);
  });
  return process.internalBuild;
}

std::string TarnReportingUtilityRetrieveAppName(const plist::Dictionary& message) {
  const plist::ValueView name = message.get("HostApplicationDisplayID");
  return name.present() ? name.asText() : "Unknown";
}

plist::Dictionary TarnReportingUtilityAddDates(const plist::Dictionary& message) {
  static const plist::Key kTimestampKey("tarnreporting_timestamp");
  static const plist::Key kSystemUptimeKey("systemuptime_sec");
  static const plist::Key kProcessUptimeKey("processuptime_ms");
  const platform::Clock& clock = TarnReportingFacilities().clock;
  plist::Dictionary stamped = message;
  stamped.set(kTimestampKey, clock.epochSeconds());
  stamped.set(kSystemUptimeKey, roundedToInt32(clock.systemUptimeSeconds()));
  stamped.set(kProcessUptimeKey, processorMilliseconds(clock.processorTicks()));
  return stamped;
}

double TarnReportingUtilityRoundWithPlaces(double value, std::int32_t places) {
  const double power = std::pow(10.0, places);
  return std::round(value * power) / power;
}

std::optional<std::string> TarnReportingUtilityBucketNumberToString(double number, std::span<const double> buckets,
                                                                    std::int32_t places) {
  if (buckets.empty()) return std::nullopt;
  double best = buckets.front();
  for (const double bucket : buckets) {
    if (std::abs(number - bucket) > std::abs(number - best)) break;
    best = bucket;
  }
  const std::size_t least = places == 0 ? 0 : 1;
  // A formatter never shows fewer decimals at most than at least.
  const auto most = static_cast<std::size_t>(std::max<std::int64_t>(places, static_cast<std::int64_t>(least)));
  return formatDecimal(best, least, most);
}

bool TarnReportingUtilityKeyIsPresentAndHasChanged(const plist::Key& key, const plist::Dictionary* first,
                                                   const plist::Dictionary* second) {
  if (first == nullptr || second == nullptr) return false;
  const plist::ValueView before = first->get(key);
  const plist::ValueView after = second->get(key);
  return before.present() && after.present() && !(before == after);
}

std::string TarnReportingLogsDirectory() {
  return TarnReportingFacilities().fileSystem.wellKnownDirectory(platform::WellKnownDirectory::DiagnosticLogs) +
         "/Audio/Reporting";
}

const std::shared_ptr<platform::WorkQueue>& TarnReportingUtilityGetReportingServerQueue() {
  ProcessState& process = ProcessState::current();
  std::call_once(process.serverQueueOnce, [&process] {
    process.serverQueue =
        process.facilities.workQueues.makeSerialQueue(kServerQueueName, platform::QualityOfService::UserInteractive);
  });
  return process.serverQueue;
}

}  // namespace tarn
