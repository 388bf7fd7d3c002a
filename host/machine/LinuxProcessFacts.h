// SPDX-License-Identifier: Apache-2.0
// LinuxProcessFacts: facts about processes and the machine, read from /proc and /sys each time they are asked for.
//
// Thermal state: the worst of all enabled thermal zones, each measured against its own trip points. At or above a
// passive trip point (the kernel slows the machine down) it is fair, a hot one serious, a critical one (the kernel
// switches off) critical; below all of them, with active ones (fans) alone, and without any zone it is nominal.
//
// Low-power mode: the platform profile is "low-power", by the firmware's own file or, where that is missing, by any
// platform-profile device. The other profiles ("quiet" and "cool" are about noise and warmth) don't count.
//
// Threads: any.
#pragma once

#include "platform/ProcessFacts.h"

namespace tarn::linux_host {

class LinuxProcessFacts final : public platform::ProcessFacts {
 public:
  // The roots are where /proc and /sys are found; tests give folders that look like them. Nothing is read here.
  explicit LinuxProcessFacts(std::string procRoot = "/proc", std::string sysRoot = "/sys");

  std::int32_t ownProcessIdentifier() const override;
  // The kernel's name for the process, made text where its bytes are none. The kernel cuts names at 15 bytes; the
  // executable's name, or the first argument's, completes one that may have been cut. Nothing for a process that has
  // ended, one that is hidden, and for 0 and below, which is a peer outside our process namespace.
  std::optional<std::string> processName(std::int32_t processIdentifier) const override;
  // Anonymous resident memory and swapped memory, in bytes: what would be free if this process weren't there. Fails
  // with the file's name when /proc doesn't tell.
  Result<std::uint64_t> physicalFootprint() const override;
  // A handful of small files for each zone, at most 64 trip points of it; one that can't be read counts as absent.
  platform::ThermalState thermalState() const override;
  // False where nothing tells of a profile.
  bool lowPowerModeEnabled() const override;
  // Zeros when the system doesn't tell.
  platform::LoadAverages loadAverages() const override;

 private:
  const std::string procRoot_;
  const std::string sysRoot_;
};

}  // namespace tarn::linux_host
