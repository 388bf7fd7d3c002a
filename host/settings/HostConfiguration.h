// SPDX-License-Identifier: Apache-2.0
// HostConfiguration: the service's configuration file (TOML), read into the structures that use it. What the file
// leaves out keeps its default there, so no default stands in two places. Unknown keys, wrong types and values outside
// their range are errors: a setting that is misspelt must not be one that is silently off.
//
// Reading changes nothing but what it returns. Threads: any; plain data.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/socket/HostLimits.h"
#include "platform/Log.h"
#include "platform/SnareService.h"
#include "plist/Result.h"
#include "recorder/RecorderOptions.h"
#include "recorder/RecorderRtcReportingService.h"

namespace tarn::linux_host {

// The whole file, its sections as members. Equal configurations are the same in every setting.
struct HostConfiguration {
  // [tally]: which analytics events anybody wants. The others are not recorded, nor formed.
  struct Tally {
    std::vector<std::string> inUse{"*"};  // glob patterns of the event names that somebody wants
    bool operator==(const Tally&) const = default;
  };
  // [snare]: how the stand-in for bug capture answers.
  struct Snare {
    std::optional<platform::SnareReason> refuse;  // with what bug captures are refused; empty in the file: they aren't
    bool operator==(const Snare&) const = default;
  };
  // [access]: what the clients of the ordinary socket may see and do.
  struct Access {
    bool separateAdmin = false;  // its own user's sessions alone, and not end the service; the admin socket is for that
    bool operator==(const Access&) const = default;
  };
  // [paths]: places outside the defaults. Each is taken as written: a relative one is the working directory's.
  struct Paths {
    std::optional<std::string> diagnosticLogs;  // the folder that holds DiagnosticLogs/; else the state directory
    std::optional<std::string> flume;  // the folder of driver report channels; else flume/ in the state directory
    std::optional<std::string> alsa;   // the kernel's tree of sound hardware; else none is looked at
    std::optional<std::string> traceAnalysis;  // the trace-analysis library; else the one beside the program
    bool operator==(const Paths&) const = default;
  };

  // [log]: from what level on is logged; the option of that name has the last word.
  platform::LogLevel logLevel = platform::LogLevel::Default;
  Tally tally;
  // [rtc]: how the stand-in for real-time-communication reporting answers.
  tarn::recorder::RecorderRtcReportingService::Behaviour rtc;
  Snare snare;
  Access access;
  Paths paths;
  // [recorder]: whether there is one, and what it keeps.
  bool recorderEnabled = true;  // false: nothing stands in for the back-ends, and nothing is recorded
  tarn::recorder::RecorderOptions recorder;
  // [limits]: those of the host's bounds that an operator may set; the others keep their constants.
  HostLimits limits;

  bool operator==(const HostConfiguration&) const = default;
};

// When a running service that reads its configuration anew takes over a change of a setting. Each setting says it in
// the table of settings; documents and log lines come from there.
enum class SettingEffect : std::uint8_t {
  AtOnce,     // for what is there too
  NewOnes,    // for sessions that start and connections that come
  AtRestart,  // not while it runs
};
// "at once", "new ones" or "restart", as the documents say it.
std::string_view nameOf(SettingEffect effect) noexcept;

struct SettingDescription {
  std::string_view section;
  std::string_view key;
  SettingEffect effect;
};
// All of them, in the order of the documents.
std::vector<SettingDescription> describedSettings();

// Names of settings, "section.key".
struct SettingChanges {
  std::vector<std::string> taken;
  std::vector<std::string> waiting;  // for a restart

  bool operator==(const SettingChanges&) const = default;
};
// Takes over into `inForce` what may change while the service runs; what changed, and what is another one than what is
// in force and stays so until a restart.
SettingChanges adoptSettings(HostConfiguration& inForce, const HostConfiguration& read);

// Reads the file; at most 1 MiB. An error reads "NAME:LINE: what is wrong", in one line whatever the file holds, and is
// the one that stands first in the file; or "NAME: why it can't be read". Then the defaults stand beside it. A file
// that isn't there is such an error: who may do without one asks first.
// `base` is what holds where the file says nothing.
Result<HostConfiguration> readConfiguration(const std::string& path, const HostConfiguration& base = {});
// The same of a text that is in memory; `name` stands for the file in errors. No file is looked at, nor are those that
// settings name.
Result<HostConfiguration> parseConfiguration(std::string_view text, std::string_view name,
                                             const HostConfiguration& base = {});
// The file and its drop-ins: the files PATH.d/*.toml in the order of their names' bytes, of which each has the last
// word over those before it, setting by setting. Names that begin with a dot are passed over. `mayBeAbsent`: without
// the file its drop-ins stand on the defaults; without both the defaults hold. One error anywhere, an unreadable folder
// or more than 256 drop-ins included, and nothing is taken.
Result<HostConfiguration> readConfigurationWithDropIns(const std::string& path, bool mayBeAbsent);

}  // namespace tarn::linux_host
