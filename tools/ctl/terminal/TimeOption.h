// SPDX-License-Identifier: Apache-2.0
// TimeOption: a moment as people write it on a command line.
//
//   2026-11-20 10:00   2026-11-20   -90s   -30m   -1h   -2d   today   yesterday   @1795158000.5
//
// A date without a time is its beginning, "today" and "yesterday" too; seconds may follow the minutes, and a T may
// stand for the blank. Days and times are those of the user's time zone, -1h and the like are counted back from now, a
// day as 24 hours. Stateless. Threads: any, but for the zone of the process.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "plist/CalendarDate.h"
#include "plist/Result.h"

namespace CLI {
class App;
}

namespace tarn::ctl {

// Where the user is. Dates are in local time there.
struct TimeZone {
  // Nothing for a date that the calendar doesn't have. A time that the change of the clocks leaves out is the one that
  // the clocks show instead; one that comes twice is either.
  std::function<std::optional<double>(const plist::CalendarDate&)> epochOf;
  std::function<plist::CalendarDate(double epochSeconds)> dateAt;
};
// That of this process (TZ).
TimeZone userTimeZone();

// Epoch seconds. The error says what the text is and what is accepted.
Result<double> parseTime(std::string_view text, double now, const TimeZone& zone);

// "2026-11-20 10:00:00" in the zone.
std::string localTimeText(double epochSeconds, const TimeZone& zone);

// "1 h 02 min", "3 min 20 s", "12.5 s"
std::string durationText(double seconds);

// Of --since and --until, as they were given.
struct TimeRange {
  std::string sinceText;
  std::string untilText;
  // Epoch seconds, from read() on; nothing for what wasn't given.
  std::optional<double> since;
  std::optional<double> until;

  // Adds the two options to a command; this outlives it. `what` is what the span is about: "Only events".
  void addTo(CLI::App& command, const std::string& what);
  // Reads them, by the clock and the zone of this machine. Complains of what is no time, and of a span that ends before
  // it begins; false then.
  bool read();
};

// For an option: what is wrong with a number of seconds between the two, "nan" included; nothing is wrong: empty.
std::string checkSeconds(const std::string& text, double least, double most);

// Epoch seconds now.
double currentTime();

}  // namespace tarn::ctl
