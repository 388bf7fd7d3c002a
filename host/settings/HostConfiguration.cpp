// SPDX-License-Identifier: Apache-2.0
#include "host/settings/HostConfiguration.h"

#include <algorithm>
#include <array>

#include "host/log/LogLine.h"
#include "host/settings/TomlParser.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

namespace {

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

Status take(const toml::node& node, platform::LogLevel& level) {
  std::string name;
  if (Status taken = take(node, name); taken.failed()) return taken;
  const auto known = logLevelFromName(name);
  level = known.value_or(level);
  return known ? Status() : wrong("must be debug, info, default or error");
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

using Node = const toml::node&;
using Host = HostConfiguration&;

// How a setting is taken from the file, where nothing is said but its type.
struct Take {
  template <class Value>
  Status operator()(Node node, Value& setting) const {
    return take(node, setting);
  }
};

template <std::int64_t kLowest, std::int64_t kHighest>
struct Within {
  template <class Value>
  Status operator()(Node node, Value& setting) const {
    return takeWithin<kLowest, kHighest>(node, setting);
  }
  Status operator()(Node node, std::chrono::milliseconds& setting) const {
    return takeMilliseconds<kLowest, kHighest>(node, setting);
  }
};

struct TakeFile {
  Status operator()(Node node, std::optional<std::string>& setting) const { return takePath(node, "a file", setting); }
};

struct TakeAdmin {
  Status operator()(Node node, bool& separate) const {
    const auto word = node.value_exact<std::string>();
    separate = word == "separate";
    return separate || word == "shared" ? Status() : wrong("must be \"shared\" or \"separate\"");
  }
};

struct Setting {
  std::string_view section;
  std::string_view key;
  SettingEffect effect;
  Status (*apply)(Node node, Host configuration);
  // Makes it the same in `to` as in `from`; whether it was another one there.
  bool (*bring)(const HostConfiguration& from, Host to);
  bool (*differs)(const HostConfiguration& one, const HostConfiguration& other);
};

// `member` picks the setting out of a configuration, `taken` reads it.
template <class Member, class Taken>
constexpr Setting setting(std::string_view section, std::string_view key, SettingEffect effect, Member /*member*/,
                          Taken /*taken*/) {
  return {
      section,
      key,
      effect,
      [](Node node, Host host) { return Taken()(node, Member()(host)); },
      [](const HostConfiguration& from, Host to) {
        const bool differed = !(Member()(from) == Member()(to));
        Member()(to) = Member()(from);
        return differed;
      },
      [](const HostConfiguration& one, const HostConfiguration& other) { return !(Member()(one) == Member()(other)); }};
}

using Quota = Within<1, 16777216>;
using WaitingBytes = Within<65536, 1073741824>;
using LogBytes = Within<65536, std::int64_t{1} << 40U>;
using Rate = Within<0, 1'000'000'000>;
using Days = Within<1, 36500>;

constexpr auto kAtOnce = SettingEffect::AtOnce;
constexpr auto kNewOnes = SettingEffect::NewOnes;
constexpr auto kAtRestart = SettingEffect::AtRestart;

constexpr std::array kSettings{
    setting(
        "log", "level", kAtOnce, [](auto& host) -> auto& { return host.logLevel; }, Take()),
    setting(
        "tally", "in_use", kAtOnce, [](auto& host) -> auto& { return host.tally.inUse; }, Take()),
    setting(
        "rtc", "backends", kNewOnes, [](auto& host) -> auto& { return host.rtc.backends; }, Take()),
    setting(
        "rtc", "no_backends", kNewOnes, [](auto& host) -> auto& { return host.rtc.noBackends; }, Take()),
    setting(
        "rtc", "available", kNewOnes, [](auto& host) -> auto& { return host.rtc.available; }, Take()),
    setting(
        "rtc", "start_delay_ms", kAtRestart, [](auto& host) -> auto& { return host.rtc.startDelay; },
        Within<0, 3'600'000>()),
    setting(
        "snare", "refuse", kAtOnce, [](auto& host) -> auto& { return host.snare.refuse; }, Take()),
    setting(
        "access", "admin", kAtRestart, [](auto& host) -> auto& { return host.access.separateAdmin; }, TakeAdmin()),
    setting(
        "paths", "diagnostic_logs", kAtRestart, [](auto& host) -> auto& { return host.paths.diagnosticLogs; }, Take()),
    setting(
        "paths", "flume", kAtRestart, [](auto& host) -> auto& { return host.paths.flume; }, Take()),
    setting(
        "paths", "alsa", kAtRestart, [](auto& host) -> auto& { return host.paths.alsa; }, Take()),
    setting(
        "paths", "trace_analysis", kAtRestart, [](auto& host) -> auto& { return host.paths.traceAnalysis; },
        TakeFile()),
    setting(
        "paths", "exported", kAtOnce, [](auto& host) -> auto& { return host.recorder.exported; }, TakeFile()),
    setting(
        "recorder", "enabled", kAtRestart, [](auto& host) -> auto& { return host.recorderEnabled; }, Take()),
    setting(
        "recorder", "max_megabytes", kAtOnce, [](auto& host) -> auto& { return host.recorder.maxMegabytes; },
        Within<1, 1048576>()),
    setting(
        "recorder", "max_age_days", kAtOnce, [](auto& host) -> auto& { return host.recorder.maxAgeDays; }, Days()),
    setting(
        "recorder", "summary_max_age_days", kAtOnce,
        [](auto& host) -> auto& { return host.recorder.summaryMaxAgeDays; }, Days()),
    setting(
        "recorder", "redundant", kAtRestart, [](auto& host) -> auto& { return host.recorder.redundant; }, Take()),
    setting(
        "recorder", "set_aside_max_age_days", kAtRestart,
        [](auto& host) -> auto& { return host.recorder.fileMaxAges.setAside; }, Days()),
    setting(
        "recorder", "summary_file_max_age_days", kAtRestart,
        [](auto& host) -> auto& { return host.recorder.fileMaxAges.summaryFiles; }, Days()),
    setting(
        "recorder", "trace_max_age_days", kAtRestart,
        [](auto& host) -> auto& { return host.recorder.fileMaxAges.traces; }, Days()),
    setting(
        "recorder", "perf_data_max_age_days", kAtRestart,
        [](auto& host) -> auto& { return host.recorder.fileMaxAges.perfData; }, Days()),
    setting(
        "limits", "max_frame_bytes", kNewOnes, [](auto& host) -> auto& { return host.limits.maxFrameBytes; },
        Within<64, 67108864>()),
    setting(
        "limits", "half_frame_ms", kAtOnce, [](auto& host) -> auto& { return host.limits.halfFrameTime; },
        Within<100, 3'600'000>()),
    setting(
        "limits", "connections_per_user", kAtOnce,
        [](auto& host) -> auto& { return host.limits.quotas.connectionsPerUser; }, Within<1, 65536>()),
    setting(
        "limits", "sessions_per_connection", kAtOnce,
        [](auto& host) -> auto& { return host.limits.quotas.sessionsPerConnection; }, Quota()),
    setting(
        "limits", "sessions_per_user", kAtOnce, [](auto& host) -> auto& { return host.limits.quotas.sessionsPerUser; },
        Quota()),
    setting(
        "limits", "waiting_bytes_per_user", kAtOnce,
        [](auto& host) -> auto& { return host.limits.quotas.waitingBytesPerUser; }, WaitingBytes()),
    setting(
        "limits", "waiting_bytes", kAtOnce, [](auto& host) -> auto& { return host.limits.quotas.waitingBytes; },
        WaitingBytes()),
    setting(
        "limits", "log_bytes_per_session", kAtOnce, [](auto& host) -> auto& { return host.limits.logs.bytesOfSession; },
        LogBytes()),
    setting(
        "limits", "log_bytes", kAtOnce, [](auto& host) -> auto& { return host.limits.logs.bytesInAll; }, LogBytes()),
    setting(
        "limits", "log_share_per_user", kAtOnce, [](auto& host) -> auto& { return host.limits.logs.bytesOfUser; },
        LogBytes()),
    setting(
        "limits", "log_bytes_per_connection", kAtOnce,
        [](auto& host) -> auto& { return host.limits.quotas.logBytesPerConnection; }, LogBytes()),
    setting(
        "limits", "log_bytes_per_user", kAtOnce, [](auto& host) -> auto& { return host.limits.quotas.logBytesPerUser; },
        LogBytes()),
    setting(
        "limits", "messages_per_second_per_connection", kAtOnce,
        [](auto& host) -> auto& { return host.limits.quotas.messagesPerSecondPerConnection; }, Rate()),
    setting(
        "limits", "messages_per_second_per_user", kAtOnce,
        [](auto& host) -> auto& { return host.limits.quotas.messagesPerSecondPerUser; }, Rate()),
};

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

}  // namespace

std::string_view nameOf(SettingEffect effect) noexcept {
  constexpr std::array<std::string_view, 3> kNames{"at once", "new ones", "restart"};
  return kNames[static_cast<std::size_t>(effect)];
}

std::vector<SettingDescription> describedSettings() {
  std::vector<SettingDescription> described;
  for (const Setting& setting : kSettings) {
    described.push_back({setting.section, setting.key, setting.effect});
  }
  return described;
}

SettingChanges adoptSettings(HostConfiguration& inForce, const HostConfiguration& read) {
  SettingChanges changes;
  for (const Setting& setting : kSettings) {
    const bool waits = setting.effect == SettingEffect::AtRestart;
    if (waits ? setting.differs(inForce, read) : setting.bring(read, inForce)) {
      (waits ? changes.waiting : changes.taken)
          .push_back(std::string(setting.section) + "." + std::string(setting.key));
    }
  }
  return changes;
}

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

}  // namespace tarn::linux_host
