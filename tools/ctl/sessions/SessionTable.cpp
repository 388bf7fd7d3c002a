// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionTable.h"

#include <string_view>
#include <unordered_set>

#include "plist/formats/Json.h"

namespace tarn::ctl {

namespace {

void addField(std::string& line, std::string_view text) {
  line += line.empty() ? "" : ",";
  if (text.find_first_of(",\"\r\n") == std::string_view::npos) {
    line += text;
    return;
  }
  line += '"';
  for (const char c : text) {
    line.append(c == '"' ? 2 : 1, c);
  }
  line += '"';
}

std::string textOf(const plist::ValueView& value) {
  if (!value.present()) return {};
  if (value.isText()) return std::string(value.text());
  std::string text;
  plist::appendJson(text, value);
  return text;
}

std::vector<std::string> keysOf(const std::vector<SessionMessage>& messages) {
  std::vector<std::string> keys;
  std::unordered_set<std::string> known;
  for (const SessionMessage& message : messages) {
    for (const auto& entry : message.payload) {
      if (known.emplace(entry.key.text()).second) {
        keys.emplace_back(entry.key.text());
      }
    }
  }
  return keys;
}

}  // namespace

std::vector<std::string> tableOf(const std::vector<SessionMessage>& messages) {
  const std::vector<std::string> keys = keysOf(messages);
  std::vector<std::string> lines{"event,time,stamp,category,type,derived"};
  for (const std::string& key : keys) {
    addField(lines.front(), key);
  }
  for (const SessionMessage& message : messages) {
    std::string line = std::to_string(message.event);
    addField(line, textOf(message.handedOver));
    addField(line, textOf(message.stamp));
    addField(line, message.category);
    addField(line, message.type);
    addField(line, message.isDerived ? "true" : "false");
    for (const std::string& key : keys) {
      addField(line, textOf(message.payload.get(key)));
    }
    lines.push_back(std::move(line));
  }
  return lines;
}

}  // namespace tarn::ctl
