// SPDX-License-Identifier: Apache-2.0
// Settings: a configuration file in TOML by a table of what it may say, looked at whole before anything is done. What
// the table doesn't have is refused.
//
//   Settings table{{"privacy", "mode", takeText(text)}, ...};
//   if (const Status read = readSettings(table, path); read.failed()) ...
//
// The values are written to what the table names, where the file has them. Threads: any.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Result.h"

namespace tarn::fleet {

// One value, as TOML says it.
struct SettingValue {
  enum class Kind : std::uint8_t { Text, Number, Texts, Other };
  Kind kind = Kind::Other;
  std::string text;
  double number = 0;
  std::vector<std::string> texts;
};

struct Setting {
  std::string_view section;
  std::string_view key;
  // What is wrong with it, to stand after its name: "must be a number". Empty: nothing, and it was taken.
  std::function<std::string(const SettingValue&)> take;
};
using Settings = std::vector<Setting>;

std::function<std::string(const SettingValue&)> takeText(std::string& into);
// Addresses of servers, several with commas: nats://host:4222, tls://name:4222, also with a user before the host.
std::function<std::string(const SettingValue&)> takeServers(std::string& into);
std::function<std::string(const SettingValue&)> takeTexts(std::vector<std::string>& into);
// Between the two, both included.
std::function<std::string(const SettingValue&)> takeNumber(double& into, double least, double most);
std::function<std::string(const SettingValue&)> takeWhole(std::int64_t& into, std::int64_t least, std::int64_t most);

// The error is one line that begins with the name and the line's number; of several it is that which stands first.
[[nodiscard]] Status applySettings(const Settings& settings, std::string_view text, std::string_view name);
// The same of a file of at most a mebibyte. The error's code is 0 unless the file can't be read.
[[nodiscard]] Status readSettings(const Settings& settings, const std::string& path);

}  // namespace tarn::fleet
