// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/AdapterConfiguration.h"

#include <array>
#include <cerrno>
#include <fstream>
#include <iterator>
#include <optional>
#include <system_error>
#include <utility>
#include <vector>

#include "host/settings/TomlParser.h"
#include "plist/EscapedText.h"

namespace tarn::streams {

namespace {

constexpr std::size_t kMostBytes = std::size_t{1} << 20U;

// What is wrong with a setting, to stand after its name.
Error wrong(std::string text) {
  return {0, std::move(text)};
}

Status take(const toml::node& node, bool& setting) {
  const auto value = node.value_exact<bool>();
  setting = value.value_or(setting);
  return value ? Status() : wrong("must be true or false");
}

Status take(const toml::node& node, std::vector<std::string>& setting) {
  std::vector<std::string> texts;
  const toml::array* const items = node.as_array();
  for (std::size_t i = 0; items != nullptr && i < items->size(); ++i) {
    const auto text = items->get(i)->value_exact<std::string>();
    if (!text || text->empty()) return wrong("must be a list of patterns, none of them empty");
    texts.push_back(*text);
  }
  if (items == nullptr) return wrong("must be a list of patterns");
  setting = std::move(texts);
  return {};
}

Status takeType(const toml::node& node, std::uint16_t& setting) {
  const auto name = node.value_exact<std::string>();
  const auto number = name ? serviceTypeNamed(*name) : std::nullopt;
  setting = number.value_or(setting);
  return number ? Status() : wrong("must be the name of a service type");
}

struct Setting {
  std::string_view section;
  std::string_view key;
  Status (*apply)(const toml::node& node, Rules& rules);
  bool isOfPipeWire = false;  // and nobody else's
};

// A sound server's stream is that of others, who are told of where they are known.
std::vector<std::string> soundServers() {
  return {"pipewire", "pulseaudio", "jackd", "jackdbus"};
}

constexpr std::string_view kRoles = "roles";
constexpr std::string_view kTypes = "types";
constexpr std::array<Setting, 6> kSettings{{
    {"report", "off", [](const toml::node& node, Rules& rules) { return take(node, rules.off); }},
    {"report", "media_name", [](const toml::node& node, Rules& rules) { return take(node, rules.mediaNames); }, true},
    {"report", "profiler", [](const toml::node& node, Rules& rules) { return take(node, rules.profiler); }, true},
    {"report", "without_role", [](const toml::node& node, Rules& rules) { return takeType(node, rules.withoutRole); }},
    {"applications", "allow", [](const toml::node& node, Rules& rules) { return take(node, rules.allow); }},
    {"applications", "deny", [](const toml::node& node, Rules& rules) { return take(node, rules.deny); }},
}};

bool isSection(std::string_view name) {
  for (const Setting& setting : kSettings) {
    if (setting.section == name) return true;
  }
  return name == kRoles || name == kTypes;
}

// Goes through the file's tables and keeps the complaint that stands first in the file.
class Reader {
 public:
  Rules rules;

  explicit Reader(Adapter adapter) : isPipeWire_(adapter == Adapter::PipeWire) {
    if (!isPipeWire_) {
      rules.deny = soundServers();
    }
  }
  void readRoot(const toml::table& root) {
    for (const auto& [name, node] : root) {
      const toml::table* const section = node.as_table();
      if (!isSection(name.str())) {
        complain(name, "unknown " + std::string(section != nullptr ? "section" : "key") + " \"" +
                           std::string(name.str()) + "\"");
      } else if (section == nullptr) {
        complain(name, "\"" + std::string(name.str()) + "\" must be a section");
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
  void complain(const toml::key& key, std::string text) { complain(key.source().begin.line, std::move(text)); }
  void readSection(std::string_view section, const toml::table& table) {
    for (const auto& [key, node] : table) {
      const std::string name = "\"" + std::string(section) + "." + std::string(key.str()) + "\"";
      if (const Status taken = apply(section, key.str(), node); taken.code() != 0) {
        complain(key, "unknown key " + name);
      } else if (taken.failed()) {
        complain(key, name + " " + taken->text);
      }
    }
  }
  // The code isn't 0 when there is no such setting.
  Status apply(std::string_view section, std::string_view key, const toml::node& node) {
    if (section == kTypes) return takeType(node, rules.types[std::string(key)]);
    if (section == kRoles && isPipeWire_) return takeType(node, rules.roles[std::string(key)]);
    for (const Setting& setting : kSettings) {
      const bool isKnown = setting.section == section && setting.key == key && (isPipeWire_ || !setting.isOfPipeWire);
      if (isKnown) return setting.apply(node, rules);
    }
    return Error{ENOENT, {}};
  }

  bool isPipeWire_;
  std::uint64_t line_ = 0;
  std::string text_;
};

}  // namespace

Result<Rules> parseConfiguration(Adapter adapter, std::string_view text, std::string_view name) {
  const toml::parse_result parsed = toml::parse(text);
  Reader reader(adapter);
  if (parsed) {
    reader.readRoot(parsed.table());
  } else {
    reader.complain(parsed.error().source().begin.line, std::string(parsed.error().description()));
  }
  if (Status fault = reader.fault(name); fault.failed()) return {{}, std::move(fault)};
  return {std::move(reader.rules), {}};
}

Result<Rules> readConfiguration(Adapter adapter, const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  std::string text;
  char block[4096];
  while (file.good() && text.size() <= kMostBytes) {
    file.read(block, sizeof block);
    text.append(block, static_cast<std::size_t>(file.gcount()));
  }
  if (!file.eof()) {
    const int code = file.is_open() ? EFBIG : errno != 0 ? errno : EIO;
    return {{}, Error{code, path + ": " + std::generic_category().message(code)}};
  }
  return parseConfiguration(adapter, text, path);
}

}  // namespace tarn::streams
