// SPDX-License-Identifier: Apache-2.0
// The one logging helper. Every log line of the system has the prefix "%25s:%-5d " (module, line) before its text; a
// module names itself and its category once, in a logger:
//
//   constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSession"};
//   kLog(LogLevel::Info, "created reporting session for ID: %lli", id);
//
// A conversion in the text (%@, %s, %i, %d, %u, %ld, %lu, %lli, %lld, %llu, %f, %x) takes the next argument and prints
// it by the argument's own type, so a wrong letter can't read wrong memory: integers in decimal (%x: hexadecimal), a
// double as %f says with six decimals, or as its text form with %@, texts as they are, property-list values by their
// text form. "%%" is one percent sign. An argument may be a callable: it is called only when the line is written, so a
// dear description costs nothing while its level is off.
//
// A disabled level costs one branch and formats nothing. Nothing is thrown: where memory is missing for the line, a
// short one stands in its place. Threads: any.
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <new>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "platform/Log.h"
#include "plist/ValueView.h"

namespace tarn {

using platform::LogLevel;

// Texts hold what clients send. One that is longer is cut and tells so, or a client could have megabytes written with
// each of its requests. Bytes of a line with its prefix. The cut is between two characters, and " ... (N more bytes)"
// follows it.
inline constexpr std::size_t kTarnReportingMostLogBytes = 65536;

// The text of a log line together with the line where it stands.
struct LogText {
  consteval LogText(const char* format, int where = __builtin_LINE())  // NOLINT(google-explicit-constructor)
      : text(format), line(where) {}
  std::string_view text;
  int line;
};

// One argument of a log line, looked at while the line is formed.
using LogArgument = plist::ValueView;

namespace detail {

// The installed log, kept here so that the test of the level is one load and one branch.
// NOLINTNEXTLINE(cppcoreguidelines-avoid-non-const-global-variables)
extern const platform::Log* installedLog;

// False while no log is installed.
inline bool logEnabled(LogLevel level) noexcept {
  return installedLog != nullptr && level >= installedLog->threshold();
}
// Forms the line and hands it to the installed log. A conversion without an argument prints "(null)", further arguments
// are left out, and an unknown conversion stays as it is written. Out of line, so that a call site is small.
void logWrite(const platform::LogCategory& category, LogLevel level, std::string_view module, const LogText& text,
              std::initializer_list<LogArgument> arguments);
// The line in the place of one that there was no memory for.
void logShortage(const platform::LogCategory& category, LogLevel level, std::string_view module, int line) noexcept;

// What an argument is turned into before it is looked at: a callable into its result, everything else into itself.
template <class Argument>
decltype(auto) logValue(const Argument& argument) {
  if constexpr (std::invocable<const Argument&>) {
    return argument();
  } else {
    return (argument);
  }
}

}  // namespace detail

// For the few places that are given their category by a caller; a module has its logger. Arguments are looked at while
// the call lasts, and the text reaches the log before it returns. The level is that of the installed log: without one,
// nothing is written.
template <class... Arguments>
void TarnReportingLog(const platform::LogCategory& category, LogLevel level, std::string_view module,
                      const LogText& text, const Arguments&... arguments) {
  if (detail::logEnabled(level)) [[unlikely]] {
    try {
      detail::logWrite(category, level, module, text, {LogArgument(detail::logValue(arguments))...});
    } catch (const std::bad_alloc&) {
      detail::logShortage(category, level, module, text.line);
    }
  }
}

// The log of one module. A module without a name is for the few lines that carry no prefix. A constant of the source
// file, without state: two pointers and a length.
class TarnReportingLogger {
 public:
  // A function and not a category, so that a logger is a constant expression.
  using Category = const platform::LogCategory& (*)();

  // `module` is the name in the prefix and must be static.
  constexpr TarnReportingLogger(Category category, std::string_view module) : category_(category), module_(module) {}

  // Writes a line. The text is a constant, so its line number is that of the call.
  template <class... Arguments>
  void operator()(LogLevel level, const LogText& text, const Arguments&... arguments) const {
    if (detail::logEnabled(level)) [[unlikely]] {
      TarnReportingLog(category_(), level, module_, text, arguments...);
    }
  }

 private:
  Category category_;
  std::string_view module_;
};

// The log categories, all under the subsystem "sys.oxbow.tarnkit". Each is static and has a short code by which readers
// of the log filter, from the first on: tarnrc (clients), tarnrs (the service), tarnrr (sessions and most workers),
// tarnri (rtc), tarnrd (drivers), tarnrt (traces), tarnrp (wattlog), tarnra (pylon), tarnrb (snare), tarnru
// (summaries), tarnrl (DP), tarnrz (audio registration).
const platform::LogCategory& TarnReportingClientCategory();
const platform::LogCategory& TarnReportingServiceDelegateCategory();
const platform::LogCategory& TarnReportingSessionCategory();
const platform::LogCategory& TarnReportingSessionRTCReportingCategory();
const platform::LogCategory& TarnReportingDriverUtilityCategory();
const platform::LogCategory& TarnReportingTraceCategory();
const platform::LogCategory& TarnReportingWattlogCategory();
const platform::LogCategory& TarnReportingPylonLogCategory();
const platform::LogCategory& TarnReportingSnareLogCategory();
const platform::LogCategory& TarnReportingSummaryLogCategory();
const platform::LogCategory& TarnReportingDPLogCategory();
const platform::LogCategory& TarnReportingAudioRegistrationCategory();

}  // namespace tarn
