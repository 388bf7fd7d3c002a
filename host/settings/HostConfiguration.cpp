// SPDX-License-Identifier: Apache-2.0
#include "host/settings/HostConfiguration.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>

#include "host/settings/TomlParser.h"
#include "host/system/FolderNames.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumFileBytes = std::size_t{1} << 20U;
constexpr std::size_t kMostDropIns = 256;

// What is wrong with a setting, to stand after its name.
Error wrong(std::string text) {
  return {0, std::move(text)};
}

Status take(const toml::node& node, bool& setting) {
  const auto value = node.value_exact<bool>();
  setting = value.value_or(setting);
  return value ? Status() : wrong("must be true or false");
}

Status take(const toml::node& node, std::string& setting) {
  const auto value = node.value_exact<std::string>();
  setting = value.value_or(setting);
  return value ? Status() : wrong("must be a text");
}

Status take(const toml::node& node, std::optional<platform::SnareReason>& reason) {
  constexpr auto& kNames = platform::kSnareReasonNames;
  std::string name;
  if (Status taken = take(node, name); taken.failed()) return taken;
  reason.reset();
  if (name.empty()) return {};
  const auto* const found = std::find(kNames.begin(), kNames.end(), name);
  if (found == kNames.end()) return wrong("must be the name of a reason code, or empty");
  reason = static_cast<platform::SnareReason>(found - kNames.begin());
  return {};
}

Status take(const toml::node& node, recorder::Redundant& redundant) {
  const auto word = node.value_exact<std::string>();
  if (word == "count") {
    redundant = recorder::Redundant::Count;
  } else if (word == "mark") {
    redundant = recorder::Redundant::Mark;
  } else {
    return wrong("must be \"count\" or \"mark\"");
  }
  return {};
}

Status takePath(const toml::node& node, const char* what, std::optional<std::string>& path) {
  path = node.value_exact<std::string>();
  return path && !path->empty() ? Status() : wrong(std::string("must be ") + what + "'s path");
}

Status take(const toml::node& node, std::optional<std::string>& folder) {
  return takePath(node, "a folder", folder);
}

Status take(const toml::node& node, std::vector<std::string>& setting) {
  const toml::array* items = node.as_array();
  std::vector<std::string> texts;
  if (items != nullptr) {
    for (const toml::node& item : *items) {
      if (const auto text = item.value_exact<std::string>()) {
        texts.push_back(*text);
      }
    }
  }
  if (items == nullptr || texts.size() != items->size()) return wrong("must be a list of texts");
  setting = std::move(texts);
  return {};
}

Status takeWhole(const toml::node& node, std::int64_t lowest, std::int64_t highest, std::int64_t& number) {
  const auto value = node.value_exact<std::int64_t>();
  if (!value || *value < lowest || *value > highest) {
    return wrong("must be a whole number from " + std::to_string(lowest) + " to " + std::to_string(highest));
  }
  number = *value;
  return {};
}

template <std::int64_t kLowest, std::int64_t kHighest, class Number>
Status takeWithin(const toml::node& node, Number& setting) {
  std::int64_t number = static_cast<std::int64_t>(setting);
  Status taken = takeWhole(node, kLowest, kHighest, number);
  setting = static_cast<Number>(number);
  return taken;
}

template <std::int64_t kLowest, std::int64_t kHighest>
Status takeMilliseconds(const toml::node& node, std::chrono::milliseconds& setting) {
  std::int64_t number = setting.count();
  Status taken = takeWhole(node, kLowest, kHighest, number);
  setting = std::chrono::milliseconds(number);
  return taken;
}

Status takeDelay(const toml::node& node, std::chrono::milliseconds& setting) {
  return takeMilliseconds<0, 3'600'000>(node, setting);
}

Status takeRate(const toml::node& node, std::size_t& setting) {
  return takeWithin<0, 1'000'000'000>(node, setting);
}

constexpr std::int64_t kMostBytes = std::int64_t{1} << 40U;

struct Setting {
  std::string_view section;
  std::string_view key;
  Status (*apply)(const toml::node& node, HostConfiguration& configuration);
};

using Node = const toml::node&;
using Host = HostConfiguration&;
constexpr std::array<Setting, 33> kSettings{{
    {"tally", "in_use", [](Node node, Host host) { return take(node, host.tally.inUse); }},
    {"rtc", "backends", [](Node node, Host host) { return take(node, host.rtc.backends); }},
    {"rtc", "no_backends", [](Node node, Host host) { return take(node, host.rtc.noBackends); }},
    {"rtc", "available", [](Node node, Host host) { return take(node, host.rtc.available); }},
    {"rtc", "start_delay_ms", [](Node node, Host host) { return takeDelay(node, host.rtc.startDelay); }},
    {"snare", "refuse", [](Node node, Host host) { return take(node, host.snare.refuse); }},
    {"paths", "diagnostic_logs", [](Node node, Host host) { return take(node, host.paths.diagnosticLogs); }},
    {"paths", "flume", [](Node node, Host host) { return take(node, host.paths.flume); }},
    {"paths", "alsa", [](Node node, Host host) { return take(node, host.paths.alsa); }},
    {"paths", "trace_analysis",
     [](Node node, Host host) { return takePath(node, "a file", host.paths.traceAnalysis); }},
    {"recorder", "enabled", [](Node node, Host host) { return take(node, host.recorderEnabled); }},
    {"recorder", "max_megabytes",
     [](Node node, Host host) { return takeWithin<1, 1048576>(node, host.recorder.maxMegabytes); }},
    {"recorder", "max_age_days",
     [](Node node, Host host) { return takeWithin<1, 36500>(node, host.recorder.maxAgeDays); }},
    {"recorder", "summary_max_age_days",
     [](Node node, Host host) { return takeWithin<1, 36500>(node, host.recorder.summaryMaxAgeDays); }},
    {"recorder", "redundant", [](Node node, Host host) { return take(node, host.recorder.redundant); }},
    {"recorder", "set_aside_max_age_days",
     [](Node node, Host host) { return takeWithin<1, 36500>(node, host.recorder.fileMaxAges.setAside); }},
    {"recorder", "summary_file_max_age_days",
     [](Node node, Host host) { return takeWithin<1, 36500>(node, host.recorder.fileMaxAges.summaryFiles); }},
    {"recorder", "trace_max_age_days",
     [](Node node, Host host) { return takeWithin<1, 36500>(node, host.recorder.fileMaxAges.traces); }},
    {"recorder", "perf_data_max_age_days",
     [](Node node, Host host) { return takeWithin<1, 36500>(node, host.recorder.fileMaxAges.perfData); }},
    {"limits", "max_frame_bytes",
     [](Node node, Host host) { return takeWithin<64, 67108864>(node, host.limits.maxFrameBytes); }},
    {"limits", "half_frame_ms",
     [](Node node, Host host) { return takeMilliseconds<100, 3'600'000>(node, host.limits.halfFrameTime); }},
    {"limits", "connections_per_user",
     [](Node node, Host host) { return takeWithin<1, 65536>(node, host.limits.quotas.connectionsPerUser); }},
    {"limits", "sessions_per_connection",
     [](Node node, Host host) { return takeWithin<1, 16777216>(node, host.limits.quotas.sessionsPerConnection); }},
    {"limits", "sessions_per_user",
     [](Node node, Host host) { return takeWithin<1, 16777216>(node, host.limits.quotas.sessionsPerUser); }},
    {"limits", "waiting_bytes_per_user",
     [](Node node, Host host) { return takeWithin<65536, 1073741824>(node, host.limits.quotas.waitingBytesPerUser); }},
    {"limits", "waiting_bytes",
     [](Node node, Host host) { return takeWithin<65536, 1073741824>(node, host.limits.quotas.waitingBytes); }},
    {"limits", "log_bytes_per_session",
     [](Node node, Host host) { return takeWithin<65536, kMostBytes>(node, host.limits.logs.bytesOfSession); }},
    {"limits", "log_bytes",
     [](Node node, Host host) { return takeWithin<65536, kMostBytes>(node, host.limits.logs.bytesInAll); }},
    {"limits", "log_share_per_user",
     [](Node node, Host host) { return takeWithin<65536, kMostBytes>(node, host.limits.logs.bytesOfUser); }},
    {"limits", "log_bytes_per_connection",
     [](Node node, Host host) {
       return takeWithin<65536, kMostBytes>(node, host.limits.quotas.logBytesPerConnection);
     }},
    {"limits", "log_bytes_per_user",
     [](Node node, Host host) { return takeWithin<65536, kMostBytes>(node, host.limits.quotas.logBytesPerUser); }},
    {"limits", "messages_per_second_per_connection",
     [](Node node, Host host) { return takeRate(node, host.limits.quotas.messagesPerSecondPerConnection); }},
    {"limits", "messages_per_second_per_user",
     [](Node node, Host host) { return takeRate(node, host.limits.quotas.messagesPerSecondPerUser); }},
}};

bool isSection(std::string_view name) {
  for (const Setting& setting : kSettings) {
    if (setting.section == name) return true;
  }
  return false;
}

const Setting* findSetting(std::string_view section, std::string_view key) {
  for (const Setting& setting : kSettings) {
    if (setting.section == section && setting.key == key) return &setting;
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
  explicit Reader(const HostConfiguration& base) : configuration(base) {}

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
      if (const Status taken = setting->apply(node, configuration); taken.failed()) {
        complain(key.source(), "\"", name, "\" " + taken->text);
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

bool isDropIn(std::string_view name) {
  return !name.starts_with('.') && name.ends_with(".toml");
}

// Their paths, in order; none where there is no such folder.
Result<std::vector<std::string>> dropInsOf(const std::string& path) {
  const std::string folder = path + ".d";
  const Result<FolderNames> listed = folderNames(folder, kMostDropIns, isDropIn);
  if (listed.failed() && listed.error->code == ENOENT) return {};
  if (listed.failed()) return {{}, errorOf(folder, *listed.error)};
  if (!listed.value.complete) return {{}, Error{0, folder + ": too many files"}};
  std::vector<std::string> paths;
  for (const std::string& name : listed.value.names) {
    paths.push_back(folder + "/" + name);
  }
  return {std::move(paths), {}};
}

// Also when it only can't be told: reading it says what is wrong.
bool isThere(const std::string& path) {
  return ::access(path.c_str(), F_OK) == 0 || (errno != ENOENT && errno != ENOTDIR);
}

}  // namespace

Result<HostConfiguration> parseConfiguration(std::string_view text, std::string_view name,
                                             const HostConfiguration& base) {
  const toml::parse_result parsed = toml::parse(text);
  Fault fault;
  HostConfiguration configuration;
  if (parsed) {
    Reader reader(base);
    reader.readRoot(parsed.table());
    fault = reader.fault();
    configuration = std::move(reader.configuration);
  } else {
    fault = {parsed.error().source().begin.line, std::string(parsed.error().description())};
  }
  if (fault.text.empty()) return {std::move(configuration), {}};
  std::string error = std::string(name) + ":" + std::to_string(fault.line) + ": ";
  plist::appendEscapedControls(error, fault.text);  // keys may hold line ends, an error is one line
  return {{}, Error{0, std::move(error)}};
}

Result<HostConfiguration> readConfiguration(const std::string& path, const HostConfiguration& base) {
  const auto file = readSmallFile(path, kMaximumFileBytes);
  if (file.failed()) return {{}, errorOf(path, *file.error)};
  return parseConfiguration(file.value, path, base);
}

Result<HostConfiguration> readConfigurationWithDropIns(const std::string& path, bool mayBeAbsent) {
  Result<std::vector<std::string>> files = dropInsOf(path);
  if (files.failed()) return {{}, std::move(files.error)};
  if (!mayBeAbsent || isThere(path)) {
    files.value.insert(files.value.begin(), path);
  }
  Result<HostConfiguration> read;
  for (const std::string& file : files.value) {
    read = readConfiguration(file, read.value);
    if (read.failed()) return {{}, std::move(read.error)};
  }
  return read;
}

}  // namespace tarn::linux_host
