// SPDX-License-Identifier: Apache-2.0
// AlsaFlume: what the machine's own sound hardware counts, as driver report channels. It reads the kernel's texts under
// one folder, /proc/asound on a real device (see AlsaText), and nothing else; no sound device is opened.
//
// A sound card is a driver, under its id. Each PCM substream has three channels, in the sub-group "pcm0p" (device and
// direction) of one of three groups:
//
//   "Speaker"   playback
//   "Rx"        playback over a digital link (HDMI, DisplayPort, S/PDIF): someone else's speakers receive it
//   "Tx"        capture
//
//   "... State"     the time in each of its states while it is open, in ms; duty cycles since the first reading
//   "... Frames"    frames that its hardware pointer passed
//   "... Overruns"  over- and underruns
//
// The kernel tells the state of now, so everything is summed up here from reading to reading, and is as fine as these
// are. A state that is new holds since the trigger time that the kernel tells, and the state before until then; what
// came and went between two readings is not seen. A pointer or counter that fell started again. Of a kernel without a
// counter of overruns, each reading that finds the substream newly in the state XRUN counts as one.
//
// A substream that can't be read is one complaint in the log until it changes, and is left out. A machine without sound
// hardware has no channels and nothing to complain about. What is beyond the bounds is left out and told once.
//
// Owner: the platform; log and clock outlive it. Threads: the server queue.
#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "host/drivers/AlsaText.h"
#include "host/drivers/FlumeSource.h"
#include "platform/Clock.h"
#include "platform/Log.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class AlsaFlume final : public FlumeSource {
 public:
  // As many as the kernel has.
  static constexpr std::size_t kMostCards = 32;  // as many as the kernel has
  // Of all cards. Each costs three small files a reading, on the server queue.
  static constexpr std::size_t kMostSubstreams = 256;

  // `folder` is the root of the kernel's tree; tests give a folder that looks like it. Nothing is read before read().
  AlsaFlume(std::string folder, platform::Log& log, const platform::Clock& clock);
  AlsaFlume(const AlsaFlume&) = delete;
  AlsaFlume& operator=(const AlsaFlume&) = delete;

  // Three channels for each substream that can be read, in the order of cards, PCMs and substreams by name; empty
  // without a tree. Sums go on from the reading before, so each reading also changes what this holds.
  platform::FlumeSamples read() override;

 private:
  // What was summed up of a substream since its first reading: of what was before, nothing counts.
  struct Sums {
    // On the monotonic clock.
    std::chrono::nanoseconds lastReading{};
    AlsaStatus last;
    std::array<std::chrono::nanoseconds, kAlsaStateCount> residencies{};
    std::array<std::uint64_t, kAlsaStateCount> transitions{};
    std::uint64_t frames = 0;
    std::uint64_t overruns = 0;
  };
  // Where one lies, each part as its folder is named.
  struct Substream {
    std::string card;  // "card0"
    std::string pcm;   // "pcm0p"
    std::string sub;   // "sub0"
    std::string path() const { return card + "/" + pcm + "/" + sub; }
  };
  using SumsByPath = std::map<std::string, Sums>;

  // Those that are there now, within the bounds; says once for the life of this that there are more.
  std::vector<Substream> substreams();
  // The card's id, as alsaName() makes it safe; the folder's name where it has none.
  std::string cardName(const std::string& card) const;
  // Adds the substream's channels and its new sums. An error is the complaint about it, and nothing was added.
  Status read(const Substream& substream, SumsByPath& sums, platform::FlumeSamples& samples) const;
  static void addChannels(const platform::FlumeChannelName& substream, const Sums& sums,
                          platform::FlumeSamples& samples);
  static Sums begun(const AlsaStatus& status, std::chrono::nanoseconds now);
  // Adds what happened since the last reading: the time that passed to the states of then and now, the pointer's and
  // counter's steps, a transition where the state or its trigger time is another.
  static void advance(Sums& sums, const AlsaStatus& status, std::chrono::nanoseconds now);

  const std::string folder_;
  platform::Log& log_;
  const platform::Clock& clock_;
  SumsByPath sums_;                          // of the substreams of the last reading
  std::map<std::string, Error> complaints_;  // likewise, by path
  bool toldBounds_ = false;
};

}  // namespace tarn::linux_host
