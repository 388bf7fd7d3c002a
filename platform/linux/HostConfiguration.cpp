#include "platform/linux/HostConfiguration.h"

#include <array>
#include <concepts>

// Results instead of exceptions, and nothing to link.
#define TOML_EXCEPTIONS 0
#define TOML_HEADER_ONLY 1
#include <toml++/toml.h>

#include "platform/linux/HostLog.h"
#include "platform/linux/SmallFile.h"
#include "plist/Json.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumFileBytes = std::size_t{1} << 20U;

// What is wrong with a setting, to stand behind its name; empty when nothing is.
using Complaint = std::string;

Complaint take(const toml::node& node, bool& setting) {
  const auto value = node.value_exact<bool>();
  setting = value.value_or(setting);
  return value ? "" : "must be true or false";
}

Complaint take(const toml::node& node, std::string& setting) {
  const auto value = node.value_exact<std::string>();
  setting = value.value_or(setting);
  return value ? "" : "must be a text";
}

Complaint take(const toml::node& node, std::optional<std::string>& folder) {
  folder = node.value_exact<std::string>();
  return folder && !folder->empty() ? "" : "must be a folder's path";
}

Complaint take(const toml::node& node, std::vector<std::string>& setting) {
  const toml::array* items = node.as_array();
  std::vector<std::string> texts;
  if (items != nullptr) {
    for (const toml::node& item : *items) {
      if (const auto text = item.value_exact<std::string>()) {
        texts.push_back(*text);
      }
    }
  }
  if (items == nullptr || texts.size() != items->size()) {
    return "must be a list of texts";
  }
  setting = std::move(texts);
  return "";
}

Complaint takeWhole(const toml::node& node, std::int64_t lowest, std::int64_t highest, std::int64_t& number) {
  const auto value = node.value_exact<std::int64_t>();
  if (!value || *value < lowest || *value > highest) {
    return "must be a whole number from " + std::to_string(lowest) + " to " + std::to_string(highest);
  }
  number = *value;
  return "";
}

template <std::int64_t kLowest, std::int64_t kHighest, std::unsigned_integral Number>
Complaint takeWithin(const toml::node& node, Number& setting) {
  std::int64_t number = static_cast<std::int64_t>(setting);
  Complaint complaint = takeWhole(node, kLowest, kHighest, number);
  setting = static_cast<Number>(number);
  return complaint;
}

Complaint takeDelay(const toml::node& node, std::chrono::milliseconds& setting) {
  std::int64_t number = setting.count();
  Complaint complaint = takeWhole(node, 0, 3'600'000, number);
  setting = std::chrono::milliseconds(number);
  return complaint;
}

struct Setting {
  std::string_view section;
  std::string_view key;
  Complaint (*apply)(const toml::node& node, HostConfiguration& configuration);
};

using Node = const toml::node&;
using Host = HostConfiguration&;
constexpr std::array<Setting, 11> kSettings{{
    {"tally", "in_use", [](Node node, Host host) { return take(node, host.tally.inUse); }},
    {"rtc", "backends", [](Node node, Host host) { return take(node, host.rtc.backends); }},
    {"rtc", "no_backends", [](Node node, Host host) { return take(node, host.rtc.noBackends); }},
    {"rtc", "available", [](Node node, Host host) { return take(node, host.rtc.available); }},
    {"rtc", "start_delay_ms", [](Node node, Host host) { return takeDelay(node, host.rtc.startDelay); }},
    {"snare", "refuse", [](Node node, Host host) { return take(node, host.snare.refuse); }},
    {"paths", "diagnostic_logs", [](Node node, Host host) { return take(node, host.paths.diagnosticLogs); }},
    {"paths", "flume", [](Node node, Host host) { return take(node, host.paths.flume); }},
    {"recorder", "max_megabytes",
     [](Node node, Host host) { return takeWithin<1, 1048576>(node, host.recorder.maximumMegabytes); }},
    {"recorder", "max_age_days",
     [](Node node, Host host) { return takeWithin<1, 36500>(node, host.recorder.maximumAgeDays); }},
    {"limits", "max_frame_bytes",
     [](Node node, Host host) { return takeWithin<64, 67108864>(node, host.limits.maximumFrameBytes); }},
}};

bool isSection(std::string_view name) {
  for (const Setting& setting : kSettings) {
    if (setting.section == name) {
      return true;
    }
  }
  return false;
}

const Setting* findSetting(std::string_view section, std::string_view key) {
  for (const Setting& setting : kSettings) {
    if (setting.section == section && setting.key == key) {
      return &setting;
    }
  }
  return nullptr;
}

struct Fault {
  std::uint64_t line = 0;
  std::string text;
};

// Goes through the file's tables, which come in the order of their names, and keeps the complaint that stands first in
// the file.
class Reader {
 public:
  HostConfiguration configuration;

  void readRoot(const toml::table& root) {
    for (const auto& [name, node] : root) {
      const toml::table* section = node.as_table();
      if (!isSection(name.str())) {
        complain(name.source(), section != nullptr ? "unknown section [" : "unknown key \"", name.str(),
                 section != nullptr ? "]" : "\"");
      } else if (section == nullptr) {
        complain(name.source(), "[", name.str(), "] must be a section");
      } else {
        readSection(name.str(), *section);
      }
    }
  }
  // The first complaint; without a text when there is none.
  const Fault& fault() const { return fault_; }

 private:
  void readSection(std::string_view section, const toml::table& table) {
    for (const auto& [key, node] : table) {
      const std::string name = std::string(section) + "." + std::string(key.str());
      const Setting* setting = findSetting(section, key.str());
      if (setting == nullptr) {
        complain(key.source(), "unknown key \"", name, "\"");
        continue;
      }
      const Complaint complaint = setting->apply(node, configuration);
      if (!complaint.empty()) {
        complain(key.source(), "\"", name, "\" " + complaint);
      }
    }
  }
  void complain(const toml::source_region& where, std::string_view before, std::string_view name,
                std::string_view behind) {
    const std::uint64_t line = where.begin.line;
    if (fault_.text.empty() || line < fault_.line) {
      fault_ = {line, std::string(before) + std::string(name) + std::string(behind)};
    }
  }

  Fault fault_;
};

}  // namespace

ReadConfiguration parseConfiguration(std::string_view text, std::string_view name) {
  const toml::parse_result parsed = toml::parse(text);
  Fault fault;
  HostConfiguration configuration;
  if (parsed) {
    Reader reader;
    reader.readRoot(parsed.table());
    fault = reader.fault();
    configuration = std::move(reader.configuration);
  } else {
    fault = {parsed.error().source().begin.line, std::string(parsed.error().description())};
  }
  if (fault.text.empty()) {
    return {std::move(configuration), {}};
  }
  std::string error = std::string(name) + ":" + std::to_string(fault.line) + ": ";
  plist::appendEscapedControls(error, fault.text);  // keys may hold line ends, an error is one line
  return {std::nullopt, std::move(error)};
}

ReadConfiguration readConfiguration(const std::string& path) {
  const SmallFile file = readSmallFile(path, kMaximumFileBytes);
  if (file.error != 0) {
    return {std::nullopt, path + errorSuffix(file.error)};
  }
  return parseConfiguration(file.content, path);
}

}  // namespace tarn::linux_host
