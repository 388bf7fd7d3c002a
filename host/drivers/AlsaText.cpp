// SPDX-License-Identifier: Apache-2.0
#include "host/drivers/AlsaText.h"

#include <algorithm>
#include <charconv>
#include <limits>

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumName = 80;
constexpr std::int64_t kNanosecondsPerSecond = 1'000'000'000;
// Later ones don't fit as nanoseconds.
constexpr std::uint64_t kMaximumSeconds = std::numeric_limits<std::int64_t>::max() / kNanosecondsPerSecond - 1;

std::string_view trimmed(std::string_view text) {
  constexpr std::string_view kBlanks = " \t\r";
  const std::size_t first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

// Calls `take(key, value)` for each line "key: value", and with an empty value for a line without a colon.
template <class Take>
void forEachLine(std::string_view text, Take take) {
  while (!text.empty()) {
    const std::size_t end = std::min(text.find('\n'), text.size());
    const std::string_view line = text.substr(0, end);
    const std::size_t colon = std::min(line.find(':'), line.size());
    take(trimmed(line.substr(0, colon)), trimmed(line.substr(std::min(colon + 1, line.size()))));
    text.remove_prefix(std::min(end + 1, text.size()));
  }
}

std::optional<std::uint64_t> wholeNumber(std::string_view text) {
  std::uint64_t number = 0;
  const auto read = std::from_chars(text.data(), text.data() + text.size(), number);
  return read.ec == std::errc() && read.ptr == text.data() + text.size() && !text.empty() ? std::optional(number)
                                                                                          : std::nullopt;
}

// The number that the text begins with, as of "44100 (44100/1)".
std::uint32_t firstNumber(std::string_view text) {
  std::uint32_t number = 0;
  std::from_chars(text.data(), text.data() + text.size(), number);
  return number;
}

// "4242.000000042": seconds and nine digits of nanoseconds. All zeros: there was no such moment yet.
std::optional<std::int64_t> nanoseconds(std::string_view text) {
  const std::size_t point = std::min(text.find('.'), text.size());
  const std::string_view behind = text.substr(std::min(point + 1, text.size()));
  const auto seconds = wholeNumber(text.substr(0, point));
  const auto fraction = wholeNumber(behind);
  if (!seconds || *seconds > kMaximumSeconds || !fraction || behind.size() != 9) return std::nullopt;
  const std::int64_t moment =
      static_cast<std::int64_t>(*seconds) * kNanosecondsPerSecond + static_cast<std::int64_t>(*fraction);
  return moment == 0 ? std::nullopt : std::optional(moment);
}

std::size_t stateOf(std::string_view name) {
  for (std::size_t state = 0; state < kAlsaStateCount; ++state) {
    if (kAlsaStates[state] == name) return state;
  }
  return kAlsaStateCount - 1;
}

}  // namespace

std::optional<AlsaStatus> parseAlsaStatus(std::string_view text) {
  AlsaStatus status;
  bool told = false;
  forEachLine(text, [&](std::string_view key, std::string_view value) {
    if (key == "closed" && value.empty()) {
      told = true;
    } else if (key == "state" && !value.empty()) {
      told = true;
      status.state = stateOf(value);
    } else if (key == "trigger_time") {
      status.triggerNanoseconds = nanoseconds(value);
    } else if (key == "tstamp") {
      status.nowNanoseconds = nanoseconds(value);
    } else if (key == "hw_ptr") {
      status.hardwarePointer = wholeNumber(value);
    } else if (key == "xrun_counter") {
      status.overruns = wholeNumber(value);
    } else if (key == "owner_pid") {
      status.owner = wholeNumber(value);
    }
  });
  return told ? std::optional(status) : std::nullopt;
}

std::optional<AlsaInfo> parseAlsaInfo(std::string_view text) {
  AlsaInfo info;
  bool told = false;
  forEachLine(text, [&](std::string_view key, std::string_view value) {
    if (key == "stream" && (value == "PLAYBACK" || value == "CAPTURE")) {
      told = true;
      info.isPlayback = value == "PLAYBACK";
    } else if (key == "id") {
      info.id = alsaName(value);
    }
  });
  return told ? std::optional(info) : std::nullopt;
}

std::optional<AlsaParameters> parseAlsaParameters(std::string_view text) {
  AlsaParameters parameters;
  forEachLine(text, [&](std::string_view key, std::string_view value) {
    if (key == "format") {
      parameters.format = alsaName(value);
    } else if (key == "channels") {
      parameters.channels = firstNumber(value);
    } else if (key == "rate") {
      parameters.rate = firstNumber(value);
    } else if (key == "period_size") {
      parameters.periodFrames = firstNumber(value);
    } else if (key == "buffer_size") {
      parameters.bufferFrames = firstNumber(value);
    }
  });
  const bool isWhole = !parameters.format.empty() && parameters.channels != 0 && parameters.rate != 0 &&
                       parameters.periodFrames != 0 && parameters.bufferFrames != 0;
  return isWhole ? std::optional(parameters) : std::nullopt;
}

std::string alsaName(std::string_view text) {
  std::string name(trimmed(text.substr(0, std::min({text.find('\n'), text.size(), kMaximumName}))));
  for (char& character : name) {
    if (character < ' ' || character > '~') {
      character = '?';
    }
  }
  return name;
}

}  // namespace tarn::linux_host
