// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/views/TopModel.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <string_view>

#include "plist/EscapedText.h"
#include "plist/formats/Json.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/report/Texts.h"

namespace tarn::ctl {

namespace {

constexpr std::string_view kQuotas = "quotas";
constexpr std::array<std::string_view, 11> kLevels{"sessions",
                                                   "connections_open",
                                                   "queued",
                                                   "messages_waiting",
                                                   "recorder_waiting",
                                                   "log_bytes",
                                                   "log_overflow_bytes",
                                                   "rings_open",
                                                   "ring_bytes_open",
                                                   "log_overflow_sessions",
                                                   "configuration_generation"};

bool isLevel(std::string_view name) {
  return std::find(kLevels.begin(), kLevels.end(), name) != kLevels.end();
}

// A number, or the sum of the numbers by reasons; nothing for what is neither.
std::optional<double> numberOf(const plist::ValueView& value) {
  if (value.isNumber()) return value.asDouble();
  if (value.kind() != plist::Kind::Dictionary) return std::nullopt;
  double sum = 0;
  for (const auto& reason : value.dictionary()) {
    if (!reason.value.isNumber()) return std::nullopt;
    sum += reason.value.asDouble();
  }
  return sum;
}

// What a counter rose in a second; nothing when it fell, as the service began anew.
std::optional<double> rateOf(std::string_view name, double value, const TopSample& now, const TopSample* before) {
  if (before == nullptr || !before->status || now.steady <= before->steady) return std::nullopt;
  const std::optional<double> earlier = numberOf(before->status->get(name));
  if (!earlier || *earlier > value) return std::nullopt;
  return (value - *earlier) / (now.steady - before->steady);
}

std::vector<TopSession> sessionsOf(const TopSample& now, const TopSample* before) {
  std::vector<TopSession> sessions;
  for (const OpenSession& session : now.sessions) {
    TopSession shown{session, std::nullopt};
    if (before != nullptr && session.newMessages && now.steady > before->steady) {
      shown.rate = static_cast<double>(*session.newMessages) / (now.steady - before->steady);
    }
    sessions.push_back(std::move(shown));
  }
  std::stable_sort(sessions.begin(), sessions.end(), [](const TopSession& a, const TopSession& b) {
    const double first = a.rate.value_or(0);
    const double second = b.rate.value_or(0);
    return first > second || (first == second && a.session.id > b.session.id);
  });
  return sessions;
}

std::string rateText(const std::optional<double>& rate) {
  if (!rate) return "-";
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%.1f", *rate);
  return text.data();
}

// The text in so many characters, with blanks after it or an ellipsis at its end.
void column(std::string& line, std::string_view text, std::size_t width) {
  const std::string shown = report::shortened(printable(text), width - 1);
  std::size_t characters = 0;
  for (const char byte : shown) {
    characters += (static_cast<unsigned char>(byte) & 0xC0U) != 0x80 ? 1 : 0;
  }
  line += shown;
  line.append(characters < width ? width - characters : 0, ' ');
  line += ' ';
}

std::string sessionLine(const TopSession& shown) {
  const OpenSession& session = shown.session;
  std::string line;
  column(line, std::to_string(session.id), 8);
  column(line, rateText(shown.rate), 10);
  column(line, session.application.empty() ? "unknown" : session.application, 28);
  column(line, session.serviceName, 18);
  column(line, session.process + " " + std::to_string(session.pid), 22);
  column(line, session.lastTime ? report::timeText(*session.lastTime).substr(11) : "-", 9);
  return line + printable(session.lastMessage);
}

std::string sessionHeading() {
  std::string line;
  column(line, "SESSION", 8);
  column(line, "MESSAGES/S", 11);
  line.pop_back();
  column(line, "APPLICATION", 28);
  column(line, "TYPE", 18);
  column(line, "CLIENT", 22);
  column(line, "LAST AT", 9);
  return line + "LAST MESSAGE";
}

std::string numbersLine(const char* what, const std::vector<TopNumber>& numbers) {
  std::string line = what;
  for (const TopNumber& number : numbers) {
    line += "  " + printable(number.name) + " " + report::numberText(number.value);
    if (number.rate && *number.rate > 0) {
      line += " (+" + rateText(number.rate) + "/s)";
    }
  }
  return line;
}

// The names among these that say something: zeros are left out.
std::vector<TopNumber> withoutZeros(const std::vector<TopNumber>& numbers) {
  std::vector<TopNumber> some;
  std::copy_if(numbers.begin(), numbers.end(), std::back_inserter(some),
               [](const TopNumber& number) { return number.value != 0; });
  return some;
}

// Breaks between two numbers, with four blanks before what goes on.
void addWrapped(std::vector<std::string>& lines, const std::string& text, std::size_t width) {
  std::string_view rest = text;
  std::string indent;
  while (indent.size() + rest.size() > width) {
    const std::size_t end = rest.rfind("  ", width - indent.size());
    if (end == std::string_view::npos || end == 0) break;
    lines.push_back(indent + std::string(rest.substr(0, end)));
    rest.remove_prefix(end + 2);
    indent = "    ";
  }
  lines.push_back(indent + std::string(rest));
}

plist::Dictionary sessionObject(const TopSession& shown) {
  const OpenSession& session = shown.session;
  plist::Dictionary object{
      {"id", session.id},           {"reporter", session.reporter},       {"pid", session.pid},
      {"process", session.process}, {"application", session.application}, {"service_name", session.serviceName},
      {"created", session.created}};
  if (shown.rate) {
    object.set("rate", *shown.rate);
  }
  if (!session.lastMessage.empty()) {
    object.set("last", session.lastMessage);
  }
  if (session.lastTime) {
    object.set("last_time", *session.lastTime);
  }
  return object;
}

}  // namespace

TopView topView(const TopSample& now, const TopSample* before) {
  TopView view;
  view.sample = now;
  view.sessions = sessionsOf(now, before);
  if (!now.status) return view;
  for (const auto& entry : *now.status) {
    const std::string name(entry.key.text());
    const std::optional<double> value = name == kQuotas ? std::nullopt : numberOf(entry.value);
    if (!value) continue;
    if (isLevel(name)) {
      view.levels.push_back({name, *value, std::nullopt});
    } else {
      view.ledger.push_back({name, *value, rateOf(name, *value, now, before)});
    }
  }
  return view;
}

std::vector<std::string> topLines(const TopView& view, std::size_t width, std::size_t height) {
  std::vector<std::string> lines;
  lines.push_back(report::timeText(view.sample.time) + " UTC  " +
                  (view.sample.status ? "the service is up" : "the service doesn't answer: " + view.sample.whyNot));
  if (view.sample.status) {
    addWrapped(lines, numbersLine("levels", view.levels), width);
    addWrapped(lines, numbersLine("ledger", withoutZeros(view.ledger)), width);
  }
  lines.emplace_back();
  if (!view.sample.storeTrouble.empty()) {
    lines.push_back("no sessions: " + view.sample.storeTrouble);
  } else {
    lines.push_back(sessionHeading());
    const std::size_t room = height > lines.size() ? height - lines.size() : 0;
    const bool fits = view.sessions.size() <= room;
    const std::size_t shown = fits ? view.sessions.size() : room - std::min<std::size_t>(room, 1);
    for (std::size_t index = 0; index < shown; ++index) {
      lines.push_back(sessionLine(view.sessions[index]));
    }
    if (!fits) {
      lines.push_back("and " + std::to_string(view.sessions.size() - shown) + " more");
    }
  }
  lines.resize(std::min(lines.size(), height));
  for (std::string& line : lines) {
    line = report::shortened(line, width - 1);
  }
  return lines;
}

std::string topJson(const TopView& view) {
  plist::Dictionary object{{"time", view.sample.time}, {"up", view.sample.status.has_value()}};
  if (view.sample.status) {
    plist::Dictionary status = *view.sample.status;
    status.remove(plist::Key(kQuotas));
    object.set("status", status);
    plist::Dictionary rates;
    for (const TopNumber& number : view.ledger) {
      if (number.rate) {
        rates.set(std::string_view(number.name), *number.rate);
      }
    }
    object.set("rates", rates);
  } else {
    object.set("why_not", view.sample.whyNot);
  }
  if (!view.sample.storeTrouble.empty()) {
    object.set("store_trouble", view.sample.storeTrouble);
  }
  std::string text;
  plist::appendJson(text, object);
  text.back() = ',';
  text += "\"sessions\":[";
  for (const TopSession& session : view.sessions) {
    if (text.back() != '[') {
      text += ',';
    }
    plist::appendJson(text, sessionObject(session));
  }
  return text + "]}";
}

}  // namespace tarn::ctl
