// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/ActionScript.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdio>
#include <tarnreporting_messages.hpp>

#include "adapters/pipewire/core/Rules.h"
#include "plist/EscapedText.h"

namespace tarn::streams {

namespace {

using tarnreporting::Category;
using tarnreporting::Type;

// Those that the adapter posts.
std::string_view nameOfCategory(std::uint32_t category) {
  switch (static_cast<Category>(category)) {
    case Category::Playback:
      return "Playback";
    case Category::Input:
      return "Input";
    case Category::IO:
      return "IO";
    case Category::RouteChange:
      return "RouteChange";
    case Category::Error:
      return "Error";
    case Category::Volume:
      return "Volume";
    case Category::Lagoon:
      return "Lagoon";
    default:
      return "Generic";
  }
}

std::string_view nameOfType(std::uint16_t type) {
  switch (static_cast<Type>(type)) {
    case Type::Start:
      return "Start";
    case Type::Stop:
      return "Stop";
    case Type::Setup:
      return "Setup";
    case Type::Error:
      return "Error";
    default:
      return "Generic";
  }
}

void appendNumber(std::string& out, double number) {
  std::array<char, 40> room{};
  const auto end = std::to_chars(room.data(), room.data() + room.size(), number);
  const std::string_view text(room.data(), static_cast<std::size_t>(end.ptr - room.data()));
  out += text;
  if (text.find_first_of(".e") == std::string_view::npos) {
    out += ".0";  // so that it stays a real number
  }
}

void appendValue(std::string& out, const FieldValue& value) {
  if (const bool* const boolean = std::get_if<bool>(&value)) {
    out += *boolean ? "true" : "false";
  } else if (const std::int64_t* const integer = std::get_if<std::int64_t>(&value)) {
    out += std::to_string(*integer);
  } else if (const double* const number = std::get_if<double>(&value)) {
    appendNumber(out, *number);
  } else {
    plist::appendJsonText(out, std::get<std::string>(value));
  }
}

void appendFields(std::string& out, const Fields& fields) {
  for (const Field& field : fields) {
    out += out.back() == '{' ? "" : ", ";
    plist::appendJsonText(out, field.key);
    out += ": ";
    appendValue(out, field.value);
  }
}

std::string lineOf(std::string_view operation, StreamNumber stream) {
  return "{\"op\": \"" + std::string(operation) + "\", \"reporterID\": " + std::to_string(stream);
}

std::string scriptOf(const BeginSession& begin) {
  std::string text = lineOf("createReportingSession", begin.stream) + "}\n" + lineOf("setServiceType", begin.stream) +
                     ", \"serviceType\": \"" + std::string(serviceTypeName(begin.serviceType)) + "\"}\n" +
                     lineOf("setConfiguration", begin.stream) + ", \"configuration\": {";
  appendFields(text, {{tarnreporting::keys::kHostApplicationDisplayID, begin.application}});
  appendFields(text, begin.configuration);
  return text + "}}\n" + lineOf("startReportingSessionForID", begin.stream) + "}\n";
}

std::string scriptOf(const PostMessage& post) {
  constexpr double kSecond = 1e9;
  std::string text = "{\"op\": \"sendMessage\", \"reporterIDs\": [" + std::to_string(post.stream) +
                     "], \"category\": \"" + std::string(nameOfCategory(post.category)) + "\", \"type\": \"" +
                     std::string(nameOfType(post.type)) + "\", \"message\": {";
  appendFields(text, post.fields);
  appendFields(text, {{tarnreporting::keys::kTarnreportingTimestamp, static_cast<double>(post.stamp) / kSecond}});
  return text + "}}\n";
}

std::string scriptOf(const EndSession& end) {
  return lineOf("stopReportingSessionForID", end.stream) + "}\n" + lineOf("destroyReportingSession", end.stream) +
         "}\n";
}

constexpr std::size_t kColumns = 8;
using Row = std::array<std::string, kColumns>;

std::string_view nameOf(NodeState state) {
  constexpr std::array<std::string_view, 5> kNames{"error", "creating", "suspended", "idle", "running"};
  return kNames[static_cast<std::size_t>(state)];
}

std::string volumeText(const std::optional<Sound>& sound) {
  if (!sound) return "-";
  char room[16];
  const int length = std::snprintf(room, sizeof room, "%.0f %%", sound->slider * 100.0);
  return std::string(room, static_cast<std::size_t>(length)) + (sound->muted ? ", muted" : "");
}

std::string orDash(std::string text) {
  return text.empty() ? "-" : text;
}

Row rowOf(const StreamView& view) {
  return {
      std::to_string(view.node),
      view.application,
      view.isOutput ? "plays" : "records",
      view.isReported ? std::string(serviceTypeName(view.serviceType)) : "not reported",
      std::string(nameOf(view.state)),
      volumeText(view.facts.sound),
      view.facts.format ? formatText(*view.facts.format) : "-",
      orDash(view.facts.route.devices) + (view.facts.route.codec.empty() ? "" : " (" + view.facts.route.codec + ")")};
}

}  // namespace

std::string scriptOf(const Action& action) {
  return std::visit([](const auto& one) { return scriptOf(one); }, action);
}

std::string tableOf(const std::vector<StreamView>& views) {
  if (views.empty()) return "no streams\n";
  std::vector<Row> rows{{"node", "application", "does", "reported as", "state", "volume", "format", "device"}};
  std::transform(views.begin(), views.end(), std::back_inserter(rows), rowOf);
  std::array<std::size_t, kColumns> widths{};
  for (Row& row : rows) {
    for (std::size_t i = 0; i < kColumns; ++i) {
      std::string printable;
      plist::appendPrintable(printable, row[i], plist::LineEnds::Escaped);
      row[i] = std::move(printable);
      widths[i] = std::max(widths[i], row[i].size());
    }
  }
  std::string text;
  for (const Row& row : rows) {
    for (std::size_t i = 0; i < kColumns; ++i) {
      text += row[i];
      text.append(i + 1 < kColumns ? widths[i] - row[i].size() + 2 : 0, ' ');
    }
    text += '\n';
  }
  return text;
}

}  // namespace tarn::streams
