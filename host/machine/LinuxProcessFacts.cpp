// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxProcessFacts.h"

#include <dirent.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdlib>
#include <memory>
#include <string_view>
#include <utility>
#include <vector>

#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "wire/Utf8.h"

namespace tarn::linux_host {

using platform::ThermalState;

namespace {

constexpr std::size_t kMaximumFactBytes = 65536;
constexpr std::size_t kKernelNameBytes = 15;  // a longer name was cut to this length
constexpr int kMaximumTripPoints = 64;

// A kernel file's one line, nothing when it can't be read.
std::optional<std::string> readLine(const std::string& path) {
  auto [line, error] = readSmallFile(path, kMaximumFactBytes);
  if (error.failed()) return std::nullopt;
  line.resize(std::min(line.find('\n'), line.size()));
  return std::move(line);
}

std::optional<std::int64_t> readNumber(const std::string& path) {
  const std::optional<std::string> line = readLine(path);
  std::int64_t number = 0;
  if (!line || std::from_chars(line->data(), line->data() + line->size(), number).ec != std::errc()) {
    return std::nullopt;
  }
  return number;
}

// A process may call itself any bytes, and the kernel cuts names inside a character; what is recorded is text.
std::string asText(std::string_view name) {
  std::string text;
  wire::appendMendedUtf8(text, name);
  return text;
}

std::string_view baseName(std::string_view path) {
  return path.substr(path.rfind('/') + 1);
}

std::string executableName(const std::string& processFolder) {
  std::array<char, 4096> target{};
  const ssize_t length = ::readlink((processFolder + "/exe").c_str(), target.data(), target.size());
  if (length <= 0) return {};
  std::string_view path(target.data(), static_cast<std::size_t>(length));
  constexpr std::string_view kDeleted = " (deleted)";  // the kernel's mark for a program that was replaced on disk
  if (path.ends_with(kDeleted)) {
    path.remove_suffix(kDeleted.size());
  }
  return std::string(baseName(path));
}

std::string firstArgumentName(const std::string& processFolder) {
  const std::string arguments = readSmallFile(processFolder + "/cmdline", kMaximumFactBytes).value;
  return std::string(baseName(std::string_view(arguments).substr(0, arguments.find('\0'))));
}

// The bytes after "NAME:" in /proc/self/status, where they are told in kB.
std::optional<std::uint64_t> statusBytes(std::string_view status, std::string_view name) {
  const std::string line = "\n" + std::string(name) + ":";
  const std::size_t at = status.find(line);
  if (at == std::string_view::npos) return std::nullopt;
  const std::string_view rest =
      status.substr(std::min(status.find_first_not_of(" \t", at + line.size()), status.size()));
  std::uint64_t kilobytes = 0;
  if (std::from_chars(rest.data(), rest.data() + rest.size(), kilobytes).ec != std::errc()) return std::nullopt;
  return kilobytes * 1024;
}

// The names in a folder that begin with `prefix`; none when it can't be read.
std::vector<std::string> namesIn(const std::string& folder, std::string_view prefix) {
  const std::unique_ptr<DIR, int (*)(DIR*)> directory(::opendir(folder.c_str()), &::closedir);
  std::vector<std::string> names;
  while (directory) {
    const dirent* entry = ::readdir(directory.get());
    if (entry == nullptr) break;
    if (std::string_view(entry->d_name).starts_with(prefix)) {
      names.emplace_back(entry->d_name);
    }
  }
  return names;
}

// What it means to be at or above a trip point of this type.
ThermalState stateAtTrip(std::string_view type) {
  if (type == "critical") return ThermalState::Critical;
  if (type == "hot") return ThermalState::Serious;
  return type == "passive" ? ThermalState::Fair : ThermalState::Nominal;
}

ThermalState zoneState(const std::string& zone) {
  const std::optional<std::int64_t> temperature = readNumber(zone + "/temp");
  if (!temperature || readLine(zone + "/mode") == "disabled") return ThermalState::Nominal;
  ThermalState worst = ThermalState::Nominal;
  for (int trip = 0; trip < kMaximumTripPoints; ++trip) {
    const std::string stem = zone + "/trip_point_" + std::to_string(trip);
    const std::optional<std::string> type = readLine(stem + "_type");
    if (!type) break;
    const std::optional<std::int64_t> limit = readNumber(stem + "_temp");
    if (limit && *limit > 0 && *temperature >= *limit) {  // zero and below: firmware's word for "not set"
      worst = std::max(worst, stateAtTrip(*type));
    }
  }
  return worst;
}

}  // namespace

LinuxProcessFacts::LinuxProcessFacts(std::string procRoot, std::string sysRoot)
    : procRoot_(std::move(procRoot)), sysRoot_(std::move(sysRoot)) {}

std::int32_t LinuxProcessFacts::ownProcessIdentifier() const {
  return ::getpid();
}

std::optional<std::string> LinuxProcessFacts::processName(std::int32_t processIdentifier) const {
  if (processIdentifier <= 0) {  // what the kernel tells of a peer outside our process namespace
    return std::nullopt;
  }
  const std::string folder = procRoot_ + "/" + std::to_string(processIdentifier);
  auto [name, error] = readSmallFile(folder + "/comm", kMaximumFactBytes);
  if (error.failed()) return std::nullopt;
  // It may itself hold line ends; the kernel adds one after it.
  if (name.ends_with('\n')) {
    name.pop_back();
  }
  if (name.size() < kKernelNameBytes) return asText(name);
  for (const std::string& whole : {executableName(folder), firstArgumentName(folder)}) {
    if (whole.starts_with(name)) return asText(whole);
  }
  return asText(name);
}

Result<std::uint64_t> LinuxProcessFacts::physicalFootprint() const {
  const std::string path = procRoot_ + "/self/status";
  const auto [status, error] = readSmallFile(path, kMaximumFactBytes);
  if (error.failed()) return {0, errorOf(path, *error)};
  const std::optional<std::uint64_t> anonymous = statusBytes(status, "RssAnon");
  const std::optional<std::uint64_t> swapped = statusBytes(status, "VmSwap");
  if (!anonymous || !swapped) return {0, Error{0, path + ": no " + (anonymous ? "VmSwap" : "RssAnon")}};
  return {*anonymous + *swapped, {}};
}

ThermalState LinuxProcessFacts::thermalState() const {
  const std::string folder = sysRoot_ + "/class/thermal/";
  ThermalState worst = ThermalState::Nominal;
  for (const std::string& zone : namesIn(folder, "thermal_zone")) {
    worst = std::max(worst, zoneState(std::string(folder).append(zone)));
  }
  return worst;
}

bool LinuxProcessFacts::lowPowerModeEnabled() const {
  constexpr std::string_view kLowPower = "low-power";
  if (const std::optional<std::string> profile = readLine(sysRoot_ + "/firmware/acpi/platform_profile")) {
    return *profile == kLowPower;
  }
  const std::string folder = sysRoot_ + "/class/platform-profile";
  const std::vector<std::string> devices = namesIn(folder, "platform-profile-");
  return std::any_of(devices.begin(), devices.end(), [&](const std::string& device) {
    return readLine(folder + "/" + device + "/profile") == kLowPower;
  });
}

platform::LoadAverages LinuxProcessFacts::loadAverages() const {
  std::array<double, 3> averages{};
  ::getloadavg(averages.data(), static_cast<int>(averages.size()));
  return {averages[0], averages[1], averages[2]};
}

}  // namespace tarn::linux_host
