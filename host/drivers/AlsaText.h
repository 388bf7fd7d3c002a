// SPDX-License-Identifier: Apache-2.0
// The kernel's texts on a PCM substream, /proc/asound/card*/pcm*/sub*/: its "status", its "info" and its "hw_params".
//
//   closed                              one word while nobody has it open, else lines "key: value":
//
//   state: RUNNING
//   owner_pid   : 1234
//   trigger_time: 4242.424242424        seconds; when it was last started, stopped or paused, by the same clock as
//   tstamp      : 4250.000000000        this, the time of the reading
//   delay       : 512
//   avail       : 15872
//   avail_max   : 16000
//   -----
//   hw_ptr      : 363636                frames that the hardware has passed since the stream was prepared
//   appl_ptr    : 364148
//   xrun_counter: 2                     since it was opened; only of a kernel that counts them
//
//   access: RW_INTERLEAVED              its parameters: "closed" or "no setup" while there are none
//   format: S16_LE
//   channels: 2
//   rate: 44100 (44100/1)
//   period_size: 1024                   frames
//   buffer_size: 4096
//
// Lines may come in any order, and others are passed over. Threads: any. Nothing is thrown.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tarn::linux_host {

// The states that are told apart, by their names; kAlsaStates[0] is that of a substream that nobody has open, the last
// one stands for names that we don't know.
inline constexpr std::string_view kAlsaStates[] = {"closed",   "OPEN",   "SETUP",     "PREPARED",     "RUNNING", "XRUN",
                                                   "DRAINING", "PAUSED", "SUSPENDED", "DISCONNECTED", "other"};
inline constexpr std::size_t kAlsaStateCount = sizeof kAlsaStates / sizeof kAlsaStates[0];
// The place of "XRUN" in kAlsaStates.
inline constexpr std::size_t kAlsaXrun = 5;

// What one reading tells. A value that is missing or is no number is absent; a time of all zeros hasn't come yet, and
// is absent too.
struct AlsaStatus {
  std::size_t state = 0;                           // index into kAlsaStates
  std::optional<std::int64_t> triggerNanoseconds;  // by a clock of the stream's choice
  std::optional<std::int64_t> nowNanoseconds;      // by the same one
  std::optional<std::uint64_t> hardwarePointer;    // frames
  std::optional<std::uint64_t> overruns;           // none: the kernel doesn't tell
  std::optional<std::uint64_t> owner;              // the thread that has it open
};

struct AlsaInfo {
  bool isPlayback = false;
  std::string id;  // "ALC287 Analog"; printable ASCII, bounded
};

// How sound is passed to or from the hardware.
struct AlsaParameters {
  std::string format;  // S16_LE
  std::uint32_t channels = 0;
  std::uint32_t rate = 0;
  std::uint32_t periodFrames = 0;
  std::uint32_t bufferFrames = 0;
  bool operator==(const AlsaParameters&) const = default;
};

// Nothing when the text tells no state, as when it was cut. Of a key that stands twice the last one counts.
std::optional<AlsaStatus> parseAlsaStatus(std::string_view text);
// Nothing when the text tells no direction ("stream: PLAYBACK" or "CAPTURE").
std::optional<AlsaInfo> parseAlsaInfo(std::string_view text);
// Nothing while nothing is set up, and when format, channels, rate or a size are missing or no numbers.
std::optional<AlsaParameters> parseAlsaParameters(std::string_view text);
// A name of the kernel's that is safe everywhere: its first line, at most 80 bytes, without blanks at its ends,
// printable ASCII with "?" for anything else. It becomes part of a channel's name and of log lines.
std::string alsaName(std::string_view text);

}  // namespace tarn::linux_host
