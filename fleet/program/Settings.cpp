// SPDX-License-Identifier: Apache-2.0
#include "fleet/program/Settings.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <iterator>
#include <utility>

#include "host/settings/TomlParser.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "plist/EscapedText.h"

namespace tarn::fleet {

namespace {

constexpr std::size_t kMostBytes = std::size_t{1} << 20U;

SettingValue valueOf(const toml::node& node) {
  SettingValue value;
  if (const auto text = node.value_exact<std::string>()) {
    value.kind = SettingValue::Kind::Text;
    value.text = *text;
  } else if (const auto number = node.value<double>(); number && node.is_number()) {
    value.kind = SettingValue::Kind::Number;
    value.number = *number;
  } else if (const toml::array* const items = node.as_array(); items != nullptr) {
    value.kind = SettingValue::Kind::Texts;
    for (const toml::node& item : *items) {
      const auto each = item.value_exact<std::string>();
      if (!each || each->empty()) {
        value.kind = SettingValue::Kind::Other;
        return value;
      }
      value.texts.push_back(*each);
    }
  }
  return value;
}

// Keeps the complaint that stands first in the file.
class Reader {
 public:
  explicit Reader(const Settings& settings) : settings_(settings) {}

  void readRoot(const toml::table& root) {
    for (const auto& [name, node] : root) {
      const toml::table* const section = node.as_table();
      if (section == nullptr || !isSection(name.str())) {
        complain(line(name), "unknown " + std::string(section != nullptr ? "section" : "key") + " \"" +
                                 std::string(name.str()) + "\"");
      } else {
        readSection(name.str(), *section);
      }
    }
  }
  void complain(std::uint64_t line, std::string text) {
    if (text_.empty() || line < line_) {
      line_ = line;
      text_ = std::move(text);
    }
  }
  Status fault(std::string_view name) const {
    if (text_.empty()) return {};
    std::string text = std::string(name) + ":" + std::to_string(line_) + ": ";
    plist::appendEscapedControls(text, text_);  // keys may hold line ends, an error is one line
    return Error{0, std::move(text)};
  }

 private:
  static std::uint64_t line(const toml::key& key) { return key.source().begin.line; }
  bool isSection(std::string_view name) const {
    for (const Setting& setting : settings_) {
      if (setting.section == name) return true;
    }
    return false;
  }
  void readSection(std::string_view section, const toml::table& table) {
    for (const auto& [key, node] : table) {
      std::string name = "\"";
      name.append(section).append(".").append(key.str()).append("\"");
      const Setting* found = nullptr;
      for (const Setting& setting : settings_) {
        if (setting.section == section && setting.key == key.str()) {
          found = &setting;
        }
      }
      if (found == nullptr) {
        complain(line(key), "unknown key " + name);
      } else if (std::string wrong = found->take(valueOf(node)); !wrong.empty()) {
        complain(line(key), name + " " + wrong);
      }
    }
  }

  const Settings& settings_;
  std::uint64_t line_ = 0;
  std::string text_;
};

// What stands before the last '@' is a user or a token, and anything.
bool isServer(std::string_view address) {
  constexpr std::string_view kSchemes[] = {"nats://", "tls://"};
  const auto* const scheme = std::find_if(std::begin(kSchemes), std::end(kSchemes),
                                          [&](std::string_view each) { return address.starts_with(each); });
  if (scheme == std::end(kSchemes)) return false;
  std::string_view host = address.substr(scheme->size());
  host.remove_prefix(host.rfind('@') == std::string_view::npos ? 0 : host.rfind('@') + 1);
  const bool isInBrackets = host.starts_with('[');
  const std::size_t hostEnd = std::min(isInBrackets ? host.find(']') : host.find(':'), host.size());
  const std::string_view name = host.substr(isInBrackets ? 1 : 0, hostEnd - (isInBrackets ? 1 : 0));
  const std::string_view allowed =
      isInBrackets ? "0123456789abcdefABCDEF:." : "0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ-._";
  if (name.empty() || name.find_first_not_of(allowed) != std::string_view::npos) return false;
  if (isInBrackets && hostEnd == host.size()) return false;
  const std::string_view port = host.substr(std::min(hostEnd + (isInBrackets ? 1 : 0), host.size()));
  if (port.empty()) return true;
  int number = 0;
  const auto [end, error] = std::from_chars(port.data() + 1, port.data() + port.size(), number);
  return port.front() == ':' && error == std::errc() && end == port.data() + port.size() && number > 0 &&
         number <= 65535;
}

}  // namespace

std::function<std::string(const SettingValue&)> takeText(std::string& into) {
  return [&into](const SettingValue& value) -> std::string {
    if (value.kind != SettingValue::Kind::Text || value.text.empty()) return "must be a text that isn't empty";
    into = value.text;
    return {};
  };
}

std::function<std::string(const SettingValue&)> takeServers(std::string& into) {
  return [&into](const SettingValue& value) -> std::string {
    bool isRight = value.kind == SettingValue::Kind::Text && !value.text.empty();
    for (std::size_t begin = 0; isRight && begin <= value.text.size();) {
      const std::size_t end = std::min(value.text.find(',', begin), value.text.size());
      isRight = isServer(std::string_view(value.text).substr(begin, end - begin));
      begin = end + 1;
    }
    if (!isRight) return "must be addresses like nats://host:4222 or tls://host:4222, with commas between them";
    into = value.text;
    return {};
  };
}

std::function<std::string(const SettingValue&)> takeTexts(std::vector<std::string>& into) {
  return [&into](const SettingValue& value) -> std::string {
    if (value.kind != SettingValue::Kind::Texts) return "must be a list of texts, none of them empty";
    into = value.texts;
    return {};
  };
}

std::function<std::string(const SettingValue&)> takeNumber(double& into, double least, double most) {
  return [&into, least, most](const SettingValue& value) -> std::string {
    const bool isRight = value.kind == SettingValue::Kind::Number && value.number >= least && value.number <= most;
    if (!isRight) {
      return "must be a number from " + std::to_string(std::llround(least)) + " to " +
             std::to_string(std::llround(most));
    }
    into = value.number;
    return {};
  };
}

std::function<std::string(const SettingValue&)> takeWhole(std::int64_t& into, std::int64_t least, std::int64_t most) {
  return [&into, least, most](const SettingValue& value) -> std::string {
    const bool isRight = value.kind == SettingValue::Kind::Number && value.number == std::floor(value.number) &&
                         value.number >= static_cast<double>(least) && value.number <= static_cast<double>(most);
    if (!isRight) return "must be a whole number from " + std::to_string(least) + " to " + std::to_string(most);
    into = static_cast<std::int64_t>(value.number);
    return {};
  };
}

Status applySettings(const Settings& settings, std::string_view text, std::string_view name) {
  const toml::parse_result parsed = toml::parse(text);
  Reader reader(settings);
  if (parsed) {
    reader.readRoot(parsed.table());
  } else {
    reader.complain(parsed.error().source().begin.line, std::string(parsed.error().description()));
  }
  return reader.fault(name);
}

Status readSettings(const Settings& settings, const std::string& path) {
  const Result<std::string> text = linux_host::readSmallFile(path, kMostBytes);
  if (text.failed()) return linux_host::errorOf(path, *text.error);
  return applySettings(settings, text.value, path);
}

}  // namespace tarn::fleet
