// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingLog.h"

#include <charconv>
#include <cmath>
#include <cstdio>
#include <string>

#include "platform/Facilities.h"
#include "platform/LogPrefix.h"
#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn {

namespace {

constexpr std::size_t kUsualPrefixBytes = 32;
constexpr std::string_view kSubsystem = "sys.oxbow.tarnkit";

void appendHexadecimal(std::string& out, const LogArgument& argument) {
  const std::uint64_t bits = argument.kind() == plist::Kind::Unsigned
                                 ? argument.unsignedValue()
                                 : static_cast<std::uint64_t>(argument.signedValue());
  char digits[16];
  const auto end = std::to_chars(std::begin(digits), std::end(digits), bits, 16).ptr;
  out.append(std::begin(digits), end);
}

void appendSixDecimals(std::string& out, double value) {
  char digits[330];  // the longest double has 309 digits before the point
  const int length = std::snprintf(digits, sizeof digits, "%f", std::isnan(value) ? std::fabs(value) : value);
  out.append(digits, static_cast<std::size_t>(length));
}

void appendArgument(std::string& out, char conversion, const LogArgument& argument) {
  const plist::Kind kind = argument.kind();
  const bool isWhole = kind == plist::Kind::Bool || kind == plist::Kind::Signed || kind == plist::Kind::Unsigned;
  const bool isFloating = kind == plist::Kind::Float || kind == plist::Kind::Double;
  if (conversion == 'x' && isWhole) {
    appendHexadecimal(out, argument);
  } else if (conversion == 'f' && isFloating) {
    appendSixDecimals(out, argument.asDouble());
  } else {
    plist::appendDescription(out, argument);
  }
}

// The length of the conversion that begins at the percent sign in front of `text`, 0 when it is none: letters that tell
// a width in bits, then the letter of the conversion.
std::size_t conversionLength(std::string_view text) {
  const std::size_t letter = text.find_first_not_of("hljtqz");
  const bool isConversion =
      letter != std::string_view::npos && std::string_view("@sidufx").find(text[letter]) != std::string_view::npos;
  return isConversion ? letter + 1 : 0;
}

void appendFormatted(std::string& out, std::string_view format, std::initializer_list<LogArgument> arguments) {
  const LogArgument* next = arguments.begin();
  while (!format.empty()) {
    const std::size_t percent = std::min(format.find('%'), format.size());
    out.append(format.substr(0, percent));
    format.remove_prefix(percent);
    if (format.empty()) return;
    format.remove_prefix(1);
    if (format.starts_with('%')) {
      out.push_back('%');
      format.remove_prefix(1);
    } else if (const std::size_t length = conversionLength(format); length > 0) {
      appendArgument(out, format[length - 1], next == arguments.end() ? LogArgument() : *next++);
      format.remove_prefix(length);
    } else {
      out.push_back('%');  // no conversion known here: the text stays as it is
    }
  }
}

void shorten(std::string& line) {
  if (line.size() <= kTarnReportingMostLogBytes) return;
  std::size_t end = kTarnReportingMostLogBytes;
  while ((static_cast<unsigned char>(line[end]) & 0xC0U) == 0x80U) {  // not inside a character
    --end;
  }
  const std::string rest = " ... (" + std::to_string(line.size() - end) + " more bytes)";
  line.replace(end, std::string::npos, rest);
}

}  // namespace

namespace detail {

void logWrite(const platform::LogCategory& category, LogLevel level, std::string_view module, const LogText& text,
              std::initializer_list<LogArgument> arguments) {
  std::string line;
  line.reserve(kUsualPrefixBytes + 2 * text.text.size());
  if (!module.empty()) {
    platform::appendLogPrefix(line, module, text.line);
  }
  appendFormatted(line, text.text, arguments);
  shorten(line);
  TarnReportingFacilities().log.write({category, level, module, text.line, line});
}

void logShortage(const platform::LogCategory& category, LogLevel level, std::string_view module, int line) noexcept {
  TarnReportingFacilities().log.write({category, level, module, line, platform::kNoMemoryForLine});
}

}  // namespace detail

const platform::LogCategory& TarnReportingClientCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrc"};
  return kCategory;
}

const platform::LogCategory& TarnReportingServiceDelegateCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrs"};
  return kCategory;
}

const platform::LogCategory& TarnReportingSessionCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrr"};
  return kCategory;
}

const platform::LogCategory& TarnReportingSessionRTCReportingCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnri"};
  return kCategory;
}

const platform::LogCategory& TarnReportingDriverUtilityCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrd"};
  return kCategory;
}

const platform::LogCategory& TarnReportingTraceCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrt"};
  return kCategory;
}

const platform::LogCategory& TarnReportingWattlogCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrp"};
  return kCategory;
}

const platform::LogCategory& TarnReportingPylonLogCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnra"};
  return kCategory;
}

const platform::LogCategory& TarnReportingSnareLogCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrb"};
  return kCategory;
}

const platform::LogCategory& TarnReportingSummaryLogCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnru"};
  return kCategory;
}

const platform::LogCategory& TarnReportingDPLogCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrl"};
  return kCategory;
}

const platform::LogCategory& TarnReportingAudioRegistrationCategory() {
  static constexpr platform::LogCategory kCategory{kSubsystem, "tarnrz"};
  return kCategory;
}

}  // namespace tarn
