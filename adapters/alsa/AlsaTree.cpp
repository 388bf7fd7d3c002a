// SPDX-License-Identifier: Apache-2.0
#include "adapters/alsa/AlsaTree.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <filesystem>
#include <string_view>
#include <system_error>
#include <utility>

namespace tarn::streams {

namespace {

using linux_host::AlsaInfo;
using linux_host::AlsaStatus;

// The kernel's texts are far smaller.
constexpr std::size_t kMostText = 4096;

// What there is of it; empty when it can't be read.
std::string textOfFile(const std::string& path) {
  const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (file < 0) return {};
  std::array<char, kMostText> room{};
  std::size_t size = 0;
  for (ssize_t got = 1; got > 0 && size < room.size();) {
    got = ::read(file, room.data() + size, room.size() - size);
    size += got > 0 ? static_cast<std::size_t>(got) : 0;
  }
  ::close(file);
  return std::string(room.data(), size);
}

// The names in a folder that begin so, in their order.
std::vector<std::string> namesIn(const std::string& folder, std::string_view beginning) {
  std::vector<std::string> names;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(folder, error), end; !error && entry != end; entry.increment(error)) {
    std::string name = entry->path().filename().string();
    const bool fits = name.size() > beginning.size() && name.compare(0, beginning.size(), beginning) == 0 &&
                      name[beginning.size()] >= '0' && name[beginning.size()] <= '9';
    if (fits) {
      names.push_back(std::move(name));
    }
  }
  std::sort(names.begin(), names.end());
  return names;
}

bool isDigital(std::string_view id) {
  for (const std::string_view part : {"HDMI", "DisplayPort", "S/PDIF", "IEC958", "Digital"}) {
    if (id.find(part) != std::string_view::npos) return true;
  }
  return false;
}

// The thread group that the kernel's text on a thread tells; 0 when it tells none.
std::uint64_t groupIn(std::string_view status) {
  constexpr std::string_view kKey = "\nTgid:\t";
  const std::size_t at = status.find(kKey);
  std::uint64_t group = 0;
  if (at != std::string_view::npos) {
    std::from_chars(status.data() + at + kKey.size(), status.data() + status.size(), group);
  }
  return group;
}

}  // namespace

std::vector<OpenSubDevice> AlsaTree::look() {
  std::string cards = textOfFile(root_ + "/asound/cards");
  if (cards.empty() || cards != cards_) {
    cards_ = std::move(cards);
    findPlaces();
  }
  std::vector<OpenSubDevice> open;
  for (const Place& place : places_) {
    if (auto found = read(place)) {
      open.push_back(*std::move(found));
    }
  }
  return open;
}

void AlsaTree::findPlaces() {
  places_.clear();
  for (const std::string& card : namesIn(root_ + "/asound", "card")) {
    findPlaces(card);
  }
  std::sort(places_.begin(), places_.end(), [](const Place& left, const Place& right) {
    return std::pair(left.name, left.folder) < std::pair(right.name, right.folder);
  });
  places_.resize(std::min(places_.size(), kMostSubDevices));
}

void AlsaTree::findPlaces(const std::string& card) {
  const std::string folder = root_ + "/asound/" + card;
  const std::string id = linux_host::alsaName(textOfFile(folder + "/id"));
  const bool isUsb = !textOfFile(folder + "/usbid").empty();
  for (const std::string& pcm : namesIn(folder, "pcm")) {
    for (const std::string& sub : namesIn(folder + "/" + pcm, "sub")) {
      std::string name = (id.empty() ? card : id) + ":" + pcm;
      std::replace(name.begin(), name.end(), ',', ' ');  // which parts the names of devices
      name += sub == "sub0" ? "" : "." + sub.substr(3);
      places_.push_back({folder + "/" + pcm + "/" + sub, std::move(name), isUsb});
    }
  }
}

// The file that the process runs, which only its own user and the system may know; else the name that it tells.
AlsaOwner AlsaTree::ownerOf(std::uint64_t thread) const {
  AlsaOwner owner;
  owner.process = groupIn(textOfFile(root_ + "/" + std::to_string(thread) + "/status"));
  if (owner.process == 0) return {thread, {}};
  const std::string folder = root_ + "/" + std::to_string(owner.process);
  std::error_code error;
  owner.program = std::filesystem::read_symlink(folder + "/exe", error).filename().string();
  if (error || owner.program.empty()) {
    owner.program = textOfFile(folder + "/comm");
    owner.program.resize(std::min(owner.program.find('\n'), owner.program.size()));
  }
  constexpr std::string_view kDeleted = " (deleted)";
  if (const std::size_t at = owner.program.rfind(kDeleted); at != std::string::npos) {
    owner.program.resize(at);
  }
  return owner;
}

std::optional<OpenSubDevice> AlsaTree::read(const Place& place) const {
  const auto status = linux_host::parseAlsaStatus(textOfFile(place.folder + "/status"));
  if (!status || status->state == 0) return std::nullopt;
  const auto info = linux_host::parseAlsaInfo(textOfFile(place.folder + "/info"));
  if (!info) return std::nullopt;
  return OpenSubDevice{place.name,
                       info->isPlayback,
                       place.isUsb,
                       isDigital(info->id),
                       ownerOf(status->owner.value_or(0)),
                       *status,
                       linux_host::parseAlsaParameters(textOfFile(place.folder + "/hw_params"))};
}

}  // namespace tarn::streams
