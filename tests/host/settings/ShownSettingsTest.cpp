// SPDX-License-Identifier: Apache-2.0
// The example configuration file and the operators' document show every setting, with the default that it has.
#include <gtest/gtest.h>

#include <fstream>
#include <map>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

#include "host/settings/HostConfiguration.h"

namespace tarn::linux_host {
namespace {

using Texts = std::map<std::string, std::string>;

std::string textOf(const std::string& path) {
  std::ifstream file(std::string(TARN_SOURCE_FOLDER "/") + path);
  std::ostringstream content;
  content << file.rdbuf();
  return content.str();
}

std::vector<std::smatch> matches(const std::string& text, const std::string& pattern) {
  const std::regex expression(pattern);
  return {std::sregex_iterator(text.begin(), text.end(), expression), std::sregex_iterator()};
}

// "[section] key" of every setting that the service knows.
std::vector<std::string> known() {
  std::vector<std::string> names;
  for (const SettingDescription& setting : describedSettings()) {
    names.push_back("[" + std::string(setting.section) + "] " + std::string(setting.key));
  }
  return names;
}

// What the example file shows, whether the line is commented out or not.
Texts shownInTheExample() {
  std::istringstream lines(textOf("packaging/tarnreportingd.toml"));
  Texts shown;
  std::string section;
  for (std::string line; std::getline(lines, line);) {
    std::smatch match;
    if (std::regex_match(line, match, std::regex("(\\[\\w+\\])"))) {
      section = match.str(1);
    } else if (std::regex_match(line, match, std::regex("#?(\\w+) = (.*)"))) {
      shown[section + " " + match.str(1)] = match.str(2);
    }
  }
  return shown;
}

Texts shownInTheDocument() {
  Texts shown;
  const std::string document = textOf("docs/operations.md");
  for (const std::smatch& row : matches(document, "\\| `(\\[\\w+\\] \\w+)` \\| ([^|]*) \\|")) {
    std::string value = row.str(2);
    std::erase(value, '`');
    shown[row.str(1)] = value;
  }
  return shown;
}

void expectTheDefaults(const Texts& shown) {
  const std::vector<std::string> names = known();
  EXPECT_EQ(shown.size(), names.size());
  for (const std::string& name : names) {
    SCOPED_TRACE(name);
    ASSERT_TRUE(shown.contains(name));
    if (name.starts_with("[paths]")) continue;  // they depend on the installation, and are told in words
    const std::string text =
        name.substr(0, name.find(' ')) + "\n" + name.substr(name.find(' ')) + " = " + shown.at(name);
    const Result<HostConfiguration> read = parseConfiguration(text, "shown");
    ASSERT_TRUE(read.ok()) << read.error->text;
    EXPECT_EQ(read.value, HostConfiguration()) << text;
  }
}

TEST(ShownSettings, ExampleFileShowsEverySettingWithItsDefault) {
  expectTheDefaults(shownInTheExample());
}

TEST(ShownSettings, DocumentShowsEverySettingWithItsDefault) {
  expectTheDefaults(shownInTheDocument());
}

// The manual page is made of the same table.
TEST(ShownSettings, DocumentTellsWhenAChangeOfEachSettingIsTakenOver) {
  const std::string document = textOf("docs/operations.md");
  Texts shown;
  for (const std::smatch& row : matches(document, "\\| `(\\[\\w+\\] \\w+)` \\| [^|]* \\| ([^|]*) \\|")) {
    shown[row.str(1)] = row.str(2);
  }
  Texts taken;
  for (const SettingDescription& setting : describedSettings()) {
    taken["[" + std::string(setting.section) + "] " + std::string(setting.key)] = nameOf(setting.effect);
  }
  EXPECT_EQ(shown, taken);
}

}  // namespace
}  // namespace tarn::linux_host
