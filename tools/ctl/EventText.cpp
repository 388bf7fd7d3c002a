// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/EventText.h"

#include <array>
#include <cmath>
#include <cstdio>

#include "plist/CalendarDate.h"
#include "plist/EscapedText.h"
#include "plist/formats/Json.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

constexpr int kIdWidth = 8;
constexpr int kTimeWidth = 24;
constexpr int kBackendWidth = 7;
constexpr int kNameWidth = 44;

void pad(std::string& line, std::size_t begin, int width) {
  const std::size_t end = begin + static_cast<std::size_t>(width);
  if (line.size() < end) {
    line.resize(end, ' ');
  }
  line += "  ";
}

void column(std::string& line, const std::string& text, int width) {
  const std::size_t begin = line.size();
  line += text;
  pad(line, begin, width);
}

// 2026-11-20T10:00:00.125Z
std::string timeText(double epochSeconds) {
  constexpr double kLastSecond = 253402300799;  // of the year 9999
  if (!(epochSeconds >= 0 && epochSeconds <= kLastSecond)) return std::to_string(epochSeconds);
  const auto milliseconds = static_cast<std::int64_t>(std::floor(epochSeconds * 1000));
  std::string text;
  plist::appendDateAndTime(text, *plist::calendarDate(static_cast<double>(milliseconds / 1000)), 'T');
  std::array<char, 8> fraction{};
  std::snprintf(fraction.data(), fraction.size(), ".%03dZ", static_cast<int>(milliseconds % 1000));
  return text + fraction.data();
}

std::string rightAligned(const std::string& text, int width) {
  const auto wanted = static_cast<std::size_t>(width);
  return text.size() < wanted ? std::string(wanted - text.size(), ' ') + text : text;
}

}  // namespace

std::string eventJson(const recorder::EventRow& row, bool hasSession) {
  std::string text = "{\"id\":" + std::to_string(row.id) + ",\"time\":";
  plist::appendJson(text, row.time);
  text += ",\"backend\":";
  plist::appendJsonText(text, row.backend);
  text += ",\"name\":";
  plist::appendJsonText(text, row.name);
  text += ",\"payload\":" + row.payload + ",\"detail\":" + row.detail;
  if (hasSession) {
    text += ",\"session\":" + (row.session ? std::to_string(*row.session) : "null");
  }
  return text + '}';
}

std::string eventLine(const recorder::EventRow& row) {
  std::string line;
  column(line, rightAligned(std::to_string(row.id), kIdWidth), kIdWidth);
  column(line, timeText(row.time), kTimeWidth);
  column(line, printable(row.backend), kBackendWidth);
  column(line, printable(row.name), kNameWidth);
  line += printable(row.payload);
  if (row.detail != "{}") {
    line += "  " + printable(row.detail);
  }
  return line;
}

std::string eventHeading() {
  std::string line;
  column(line, rightAligned("ID", kIdWidth), kIdWidth);
  column(line, "TIME", kTimeWidth);
  column(line, "BACKEND", kBackendWidth);
  column(line, "NAME", kNameWidth);
  return line + "PAYLOAD  DETAIL";
}

}  // namespace tarn::ctl
