// SPDX-License-Identifier: Apache-2.0
#include "host/settings/MachineFacts.h"

#include <algorithm>
#include <charconv>
#include <cstddef>
#include <utility>

#include "host/system/SmallFile.h"
#include "plist/Characters.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumFileBytes = std::size_t{64} << 10U;
constexpr std::size_t kMaximumFactBytes = 256;
constexpr std::string_view kBlanks(" \t\r\n\0", 5);
// The highest bit of a firmware's kind of chassis tells that it has a lock.
constexpr unsigned kChassisBits = 0x7F;

// Empty where there is nothing to be read of it.
std::string contentOf(const std::string& path) {
  Result<std::string> file = readSmallFile(path, kMaximumFileBytes);
  return file.ok() ? std::move(file.value) : std::string();
}

bool isUtf8(std::string_view text) {
  while (!text.empty()) {
    if (!plist::takeCharacter(text)) return false;
  }
  return true;
}

// A fact without the blanks and zeros around it; empty for what is none.
std::string factOf(std::string_view text) {
  const std::size_t first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return {};
  text = text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
  return text.size() <= kMaximumFactBytes && isUtf8(text) ? std::string(text) : std::string();
}

// What the shell would make of a value: one text, maybe in quotation marks.
std::string unquoted(std::string_view value) {
  const char mark = value.empty() ? '\0' : value.front();
  if (mark != '"' && mark != '\'') return std::string(value);
  std::string text;
  for (std::size_t i = 1; i < value.size() && value[i] != mark; ++i) {
    if (mark == '"' && value[i] == '\\' && i + 1 < value.size()) {
      ++i;
    }
    text += value[i];
  }
  return text;
}

// Of lines NAME=VALUE the value of the last with the name.
std::string valueIn(std::string_view content, std::string_view name) {
  std::string found;
  while (!content.empty()) {
    const std::size_t end = std::min(content.find('\n'), content.size());
    std::string_view line = content.substr(0, end);
    content.remove_prefix(std::min(end + 1, content.size()));
    line.remove_prefix(std::min(line.find_first_not_of(kBlanks), line.size()));
    if (line.size() > name.size() && line.substr(0, name.size()) == name && line[name.size()] == '=') {
      found = unquoted(line.substr(name.size() + 1));
    }
  }
  return factOf(found);
}

// By the numbers of the System Management BIOS; empty for one that tells nothing.
std::string_view chassisOf(unsigned kind) {
  switch (kind & kChassisBits) {
    case 0x03:
    case 0x04:
    case 0x06:
    case 0x07:
    case 0x0D:
      return "desktop";
    case 0x08:
    case 0x09:
    case 0x0A:
    case 0x0E:
      return "laptop";
    case 0x0B:
      return "handset";
    case 0x11:
    case 0x1C:
    case 0x1D:
      return "server";
    case 0x1E:
      return "tablet";
    case 0x1F:
    case 0x20:
      return "convertible";
    case 0x21:
    case 0x22:
      return "embedded";
    default:
      return {};
  }
}

std::string firmwaresChassis(const std::string& text) {
  unsigned kind = 0;
  std::from_chars(text.data(), text.data() + text.size(), kind);
  return std::string(chassisOf(kind));
}

std::string orElse(std::string fact, const std::string& other) {
  return fact.empty() ? other : fact;
}

}  // namespace

plist::Dictionary readMachineFacts(const std::string& root) {
  const std::string firmware = root + "/sys/class/dmi/id/";
  std::string release = contentOf(root + "/etc/os-release");
  if (release.empty()) {
    release = contentOf(root + "/usr/lib/os-release");
  }
  const std::array<std::string, kMachineFacts.size()> facts{
      valueIn(release, "PRETTY_NAME"),
      valueIn(release, "ID"),
      valueIn(release, "VERSION_ID"),
      factOf(contentOf(firmware + "sys_vendor")),
      orElse(factOf(contentOf(firmware + "product_name")), factOf(contentOf(root + "/proc/device-tree/model"))),
      orElse(valueIn(contentOf(root + "/etc/machine-info"), "CHASSIS"),
             firmwaresChassis(contentOf(firmware + "chassis_type")))};
  plist::Dictionary found;
  for (std::size_t i = 0; i < facts.size(); ++i) {
    if (!facts.at(i).empty()) {
      found.set(kMachineFacts.at(i), std::string_view(facts.at(i)));
    }
  }
  return found;
}

}  // namespace tarn::linux_host
