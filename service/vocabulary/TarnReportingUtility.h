// SPDX-License-Identifier: Apache-2.0
// Utilities that the service, the sessions and the workers share.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "plist/Dictionary.h"

namespace tarn {

namespace platform {
class Condition;
class WorkQueue;
struct LogCategory;
}  // namespace platform

// Waits until `flag` is set, for at most `timeoutSeconds` a wait: a wake-up that finds the flag unset waits the whole
// time again. Logs `waitingText` (info) before each wait and `timeoutText` (error) when the time is up. Returns whether
// the flag was set. For the server queue, which it blocks. The flag is read under the condition's lock. Set before the
// first look, it gives true with no wait and no line; a timeout of 0 with the flag unset gives false at once. After a
// wake-up "continuing" is logged (info).
bool TarnReportingUtilityWait(platform::Condition& condition, double timeoutSeconds, const bool& flag,
                              std::string_view waitingText, std::string_view timeoutText,
                              const platform::LogCategory& logCategory);
// The same for a worker that tells in words of its own what it gave up: logs nothing, and a wake-up that finds the flag
// unset doesn't prolong the wait. So it ends within `timeout` of the call, by the monotonic clock.
bool TarnReportingUtilityWait(platform::Condition& condition, std::chrono::nanoseconds timeout, const bool& flag);
// Sets the flag and wakes one waiter. Threads: any. A pair of condition and flag serves one hand-over. Neither side
// resets the flag.
void TarnReportingUtilitySignal(platform::Condition& condition, bool& flag);

// Whether this is an internal build of the device; asked once, false when the device doesn't tell. Threads: any. The
// property is "InternalBuild"; the answer holds until other facilities are installed.
bool TarnReportingUtilityIsInternalBuild();

// The value under "HostApplicationDisplayID" as text, or "Unknown" when there is none. A value that is no text comes in
// its text form.
std::string TarnReportingUtilityRetrieveAppName(const plist::Dictionary& message);

// A copy of the message with "tarnreporting_timestamp" (epoch seconds), "systemuptime_sec" (whole seconds, rounded) and
// "processuptime_ms" (processor time used, in whole milliseconds) set. Values that were there are replaced. The last
// two are 32-bit whole numbers, held to that range; the processor time is computed in single precision, as its readers
// have always got it.
plist::Dictionary TarnReportingUtilityAddDates(const plist::Dictionary& message);

// Rounds to `places` decimals, halves away from zero; negative places round to tens, hundreds and so on. As far as
// binary fractions allow: 2.345 with two places is 2.35, -1.5 with none is -2.
double TarnReportingUtilityRoundWithPlaces(double value, std::int32_t places);

// The bucket nearest to the number, as text with at most `places` decimals and at least one when `places` is not zero.
// The buckets ascend; of two equally near ones the larger wins. Nothing when there are no buckets. The search ends at
// the first bucket that is farther away than the one before it. A number beyond the last bucket gives the last. With
// the buckets 0, 5, 10: 7.5 gives "10" and 7 gives "5"; with one place 5 gives "5.0". The text has a point and no
// grouping, whatever the locale; decimals that don't fit round to even.
std::optional<std::string> TarnReportingUtilityBucketNumberToString(double number, std::span<const double> buckets,
                                                                    std::int32_t places);

// Whether both dictionaries exist, both have the key, and the two values differ. Values compare as values: 1 and 1.0
// are equal. Null stands for a dictionary that doesn't exist.
bool TarnReportingUtilityKeyIsPresentAndHasChanged(const plist::Key& key, const plist::Dictionary* first,
                                                   const plist::Dictionary* second);

// The directory of the summary files: "Audio/Reporting" in the device user's diagnostic logs. It need not exist yet.
// Absolute, without a slash at the end; nothing is made here.
std::string TarnReportingLogsDirectory();

// The one serial queue on which all client, session and worker work runs; made on first use. Threads: any. Named
// "sys.oxbow.tarnkit.reporting.server", of the user-interactive quality. It lives as long as the installed facilities
// do.
const std::shared_ptr<platform::WorkQueue>& TarnReportingUtilityGetReportingServerQueue();

}  // namespace tarn
