// SPDX-License-Identifier: Apache-2.0
// AlsaTree: reads which PCM sub-devices are open, by whom, and how they fare: the kernel's texts below /proc/asound
// (see AlsaText) and those on the processes that have them open. No sound device is opened.
//
// A look reads one small file, and one more for each sub-device; where the sub-devices lie is looked up only when the
// list of cards is another one. Owned by the program. Threads: one at a time.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "host/drivers/AlsaText.h"

namespace tarn::streams {

// The process that has a sub-device open, as far as it is told.
struct AlsaOwner {
  std::uint64_t process = 0;  // 0: it isn't known
  std::string program;        // its file's name, without the folder; empty: not known either
  bool operator==(const AlsaOwner&) const = default;
};

struct OpenSubDevice {
  std::string name;  // "PCH:pcm0p", with ".1" for the second of its PCM's; no two have the same
  bool isPlayback = true;
  bool isUsb = false;
  bool isDigital = false;  // HDMI, DisplayPort, S/PDIF
  AlsaOwner owner;
  linux_host::AlsaStatus status;
  std::optional<linux_host::AlsaParameters> parameters;
};

class AlsaTree {
 public:
  // As many as the kernel has of cards, with some sub-devices each; what is beyond is left out.
  static constexpr std::size_t kMostSubDevices = 256;

  // `root` is the folder of the kernel's texts, /proc on a real machine.
  explicit AlsaTree(std::string root) : root_(std::move(root)) {}

  // Those that are open now, in the order of their names. One that can't be read is left out.
  std::vector<OpenSubDevice> look();
  // Whether the last look found a sound card.
  bool hasCards() const { return !places_.empty(); }

 private:
  struct Place {
    std::string folder;  // of the sub-device
    std::string name;
    bool isUsb = false;
  };

  void findPlaces();
  void findPlaces(const std::string& card);
  AlsaOwner ownerOf(std::uint64_t thread) const;
  std::optional<OpenSubDevice> read(const Place& place) const;

  std::string root_;
  std::string cards_;  // as they were listed when the places were looked up
  std::vector<Place> places_;
};

}  // namespace tarn::streams
