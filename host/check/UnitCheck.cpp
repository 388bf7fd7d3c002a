// SPDX-License-Identifier: Apache-2.0
#include "host/check/UnitCheck.h"

#include <sys/stat.h>

#include <set>
#include <sstream>
#include <string_view>

#include "host/system/FolderNames.h"
#include "host/system/SmallFile.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMostUnitBytes = std::size_t{1} << 20U;
constexpr std::size_t kMostDropIns = 256;
constexpr std::string_view kUnit = "tarnreportingd.service";
constexpr std::string_view kCommand = "ExecStart=";

// The last one counts, as in the manager: an empty one takes those before it away.
void readCommand(const std::string& text, std::string& command) {
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    if (line.starts_with(kCommand)) {
      command = line.substr(kCommand.size());
    }
  }
}

// Its words, quotes taken off, and the system's state directory in the place of its specifier.
std::vector<std::string> wordsOf(const std::string& command) {
  std::vector<std::string> words;
  std::string word;
  char quote = 0;
  for (const char letter : command + " ") {
    if (quote != 0 ? letter == quote : letter == '"' || letter == '\'') {
      quote = quote != 0 ? '\0' : letter;
    } else if (letter == ' ' && quote == 0) {
      if (!word.empty()) {
        words.push_back(word);
      }
      word.clear();
    } else {
      word += letter;
    }
  }
  for (std::string& each : words) {
    if (const std::size_t place = each.find("%S"); place != std::string::npos) {
      each.replace(place, 2, "/var/lib");
    }
  }
  return words;
}

// The value of "--name VALUE" or "--name=VALUE", else nothing.
std::optional<std::string> valueOf(const std::vector<std::string>& words, const std::string& name) {
  for (std::size_t index = 0; index < words.size(); ++index) {
    if (words[index] == name && index + 1 < words.size()) return words[index + 1];
    if (words[index].starts_with(name + "=")) return words[index].substr(name.size() + 1);
  }
  return std::nullopt;
}

}  // namespace

Check checkUnit(const CheckSubject& subject) {
  const char* const name = "unit";
  if (subject.unitFolders.empty()) return good(name, "there is no service manager");
  std::string file;
  struct stat status {};
  for (const std::string& folder : subject.unitFolders) {
    file = folder + "/" + std::string(kUnit);
    if (::lstat(file.c_str(), &status) == 0) break;
    file.clear();
  }
  if (file.empty()) return good(name, "none is installed");
  const auto unit = readSmallFile(file, kMostUnitBytes);
  if (unit.failed()) {
    return bad(name, file + " is masked or can't be read: " + unit.error->text + "; systemctl unmask tarnreportingd");
  }
  std::string command;
  readCommand(unit.value, command);
  // By name, and of two with one name that of the first folder.
  std::set<std::pair<std::string, std::size_t>> dropIns;
  for (std::size_t place = 0; place < subject.unitFolders.size(); ++place) {
    const std::string folder = subject.unitFolders[place] + "/" + std::string(kUnit) + ".d";
    for (const std::string& each : folderNames(folder, kMostDropIns, [](std::string_view entry) {
                                     return entry.ends_with(".conf");
                                   }).value.names) {
      dropIns.emplace(each, place);
    }
  }
  std::string last;
  for (const auto& [each, place] : dropIns) {
    if (each == last) continue;
    last = each;
    readCommand(
        readSmallFile(subject.unitFolders[place] + "/" + std::string(kUnit) + ".d/" + each, kMostUnitBytes).value,
        command);
  }
  const std::vector<std::string> words = wordsOf(command);
  if (words.empty()) return bad(name, file + " has no command line; install it again");
  const ServiceOptions& checked = subject.options;
  const std::string configuration = checked.configurationFile.value_or(checked.defaultConfigurationFile);
  const struct {
    const char* option;
    const std::string& path;
    const std::string& fallback;
  } all[] = {{"--state-dir", checked.stateDirectory, checked.stateDirectory},
             {"--config", configuration, checked.defaultConfigurationFile}};
  for (const auto& [option, path, fallback] : all) {
    if (const std::string meant = valueOf(words, option).value_or(fallback); meant != path) {
      return bad(name, file + " starts the service with " + meant + ", checked is " + path + "; give " + option + " " +
                           meant + " to check that, or change the unit");
    }
  }
  return good(name, file + " names the files that are checked");
}

}  // namespace tarn::linux_host
