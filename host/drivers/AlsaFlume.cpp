// SPDX-License-Identifier: Apache-2.0
#include "host/drivers/AlsaFlume.h"

#include <algorithm>
#include <iterator>
#include <numeric>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "host/system/FolderNames.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

using platform::FlumeChannel;
using platform::FlumeFormat;
using platform::FlumeSamples;
using std::chrono::nanoseconds;

namespace {

constexpr std::string_view kModule = "AlsaFlume";
constexpr std::size_t kMaximumFileBytes = 4096;
constexpr std::size_t kMaximumDigits = 4;

// Whether it is the word, a number and, when there is one, one of the letters: "card0", "pcm12p".
bool isNumbered(std::string_view name, std::string_view word, std::string_view letters = {}) {
  if (!name.starts_with(word)) return false;
  name.remove_prefix(word.size());
  if (!letters.empty()) {
    if (name.empty() || letters.find(name.back()) == std::string_view::npos) return false;
    name.remove_suffix(1);
  }
  return !name.empty() && name.size() <= kMaximumDigits &&
         name.find_first_not_of("0123456789") == std::string_view::npos;
}

bool isDigitalLink(std::string_view id) {
  constexpr std::string_view kLinks[] = {"HDMI", "DisplayPort", "IEC958", "S/PDIF", "SPDIF", "Digital"};
  return std::any_of(std::begin(kLinks), std::end(kLinks),
                     [&](std::string_view link) { return id.find(link) != std::string_view::npos; });
}

const char* groupOf(const AlsaInfo& info) {
  if (!info.isPlayback) return "Tx";
  return isDigitalLink(info.id) ? "Rx" : "Speaker";
}

// How far a counter went that may have started again.
std::uint64_t steps(const std::optional<std::uint64_t>& before, const std::optional<std::uint64_t>& now) {
  if (!now) return 0;
  return before && *before <= *now ? *now - *before : *now;
}

FlumeChannel channelOf(const platform::FlumeChannelName& substream, const char* what, FlumeFormat format,
                       const char* unit) {
  FlumeChannel channel;
  channel.name = substream;
  channel.name.name = substream.name.value_or("") + what;
  channel.format = format;
  channel.unit = unit;
  return channel;
}

std::int64_t asValue(std::uint64_t count) {
  return static_cast<std::int64_t>(std::min<std::uint64_t>(count, INT64_MAX));
}

}  // namespace

AlsaFlume::AlsaFlume(std::string folder, platform::Log& log, const platform::Clock& clock)
    : folder_(std::move(folder)), log_(log), clock_(clock) {}

FlumeSamples AlsaFlume::read() {
  FlumeSamples samples;
  SumsByPath sums;
  std::map<std::string, Error> complaints;
  for (const Substream& substream : substreams()) {
    const std::string path = substream.path();
    const Status taken = read(substream, sums, samples);
    if (taken.ok()) continue;
    if (const auto before = sums_.find(path); before != sums_.end()) {
      sums.insert(*before);  // it may be readable again
    }
    if (const auto before = complaints_.find(path); before == complaints_.end() || before->second != *taken) {
      std::string text = "driver channels: the substream ";
      text.append(path).append(" ").append(taken->text);
      logPrefixed(log_, kDriverCategory, platform::LogLevel::Error, kModule, text);
    }
    complaints.emplace(path, *taken);
  }
  // Those of substreams that are gone go with them.
  sums_ = std::move(sums);
  complaints_ = std::move(complaints);
  return samples;
}

std::vector<AlsaFlume::Substream> AlsaFlume::substreams() {
  std::vector<Substream> found;
  bool complete = true;
  const auto list = [&](const std::string& path, std::size_t limit, auto isWanted) {
    auto listed = folderNames(folder_ + path, limit, isWanted);
    complete = complete && (listed.value.complete || listed.failed());
    return std::move(listed.value.names);
  };
  for (const std::string& card : list("", kMostCards, [](auto name) { return isNumbered(name, "card"); })) {
    const std::string inCard = "/" + card;
    for (const std::string& pcm :
         list(inCard, kMostSubstreams, [](auto name) { return isNumbered(name, "pcm", "pc"); })) {
      for (const std::string& sub : list(std::string(inCard).append("/").append(pcm), kMostSubstreams,
                                         [](auto name) { return isNumbered(name, "sub"); })) {
        if (found.size() < kMostSubstreams) {
          found.push_back({card, pcm, sub});
        } else {
          complete = false;
        }
      }
    }
  }
  if (!complete && !std::exchange(toldBounds_, true)) {
    logPrefixed(log_, kDriverCategory, platform::LogLevel::Error, kModule,
                "driver channels: there are more than " + std::to_string(kMostSubstreams) +
                    " PCM substreams, the others are left out");
  }
  return found;
}

std::string AlsaFlume::cardName(const std::string& card) const {
  const auto id = readSmallFile(folder_ + "/" + card + "/id", kMaximumFileBytes);
  std::string name = id.failed() ? std::string() : alsaName(id.value);
  return name.empty() ? card : name;
}

Status AlsaFlume::read(const Substream& substream, SumsByPath& sums, FlumeSamples& samples) const {
  const std::string path = substream.path();
  const auto statusFile = readSmallFile(folder_ + "/" + path + "/status", kMaximumFileBytes);
  const auto infoFile = readSmallFile(folder_ + "/" + path + "/info", kMaximumFileBytes);
  if (statusFile.failed() || infoFile.failed()) {
    return errorOf("can't be read", statusFile.failed() ? *statusFile.error : *infoFile.error);
  }
  const auto status = parseAlsaStatus(statusFile.value);
  const auto info = parseAlsaInfo(infoFile.value);
  if (!status || !info) return Error{0, status ? "tells no direction" : "tells no state"};
  const nanoseconds now = clock_.monotonic();
  const auto before = sums_.find(path);
  Sums& sum = sums.emplace(path, before == sums_.end() ? begun(*status, now) : before->second).first->second;
  advance(sum, *status, now);

  const platform::FlumeChannelName name{cardName(substream.card), groupOf(*info), substream.pcm,
                                        info->id.empty() ? substream.sub : info->id + " " + substream.sub};
  addChannels(name, sum, samples);
  return {};
}

void AlsaFlume::addChannels(const platform::FlumeChannelName& substream, const Sums& sums, FlumeSamples& samples) {
  FlumeChannel frames = channelOf(substream, " Frames", FlumeFormat::Simple, "frames");
  frames.value = asValue(sums.frames);
  FlumeChannel overruns = channelOf(substream, " Overruns", FlumeFormat::Simple, "overruns");
  overruns.value = asValue(sums.overruns);
  FlumeChannel state = channelOf(substream, " State", FlumeFormat::State, "ms");
  const nanoseconds whole = std::accumulate(sums.residencies.begin(), sums.residencies.end(), nanoseconds(0));
  for (std::size_t i = 1; i < kAlsaStateCount; ++i) {  // closed is no news: an idle machine has nothing to tell
    const nanoseconds residency = sums.residencies[i];
    state.states.push_back({std::string(kAlsaStates[i]), sums.transitions[i],
                            static_cast<std::uint64_t>(residency / std::chrono::milliseconds(1)),
                            whole.count() == 0 ? 0.0 : std::chrono::duration<double>(residency) / whole});
  }
  samples.push_back(std::move(frames));
  samples.push_back(std::move(overruns));
  samples.push_back(std::move(state));
}

// What was counted before the first reading is nobody's.
AlsaFlume::Sums AlsaFlume::begun(const AlsaStatus& status, nanoseconds now) {
  Sums sums;
  sums.lastReading = now;
  sums.last = status;
  return sums;
}

void AlsaFlume::advance(Sums& sums, const AlsaStatus& status, nanoseconds now) {
  const nanoseconds passed = std::max(now - sums.lastReading, nanoseconds(0));
  const bool triggered = status.triggerNanoseconds != sums.last.triggerNanoseconds;
  const bool changed = status.state != sums.last.state;
  // Of the time that passed, what belongs to the state of now.
  nanoseconds ofNow = changed ? nanoseconds(0) : passed;
  if (changed && triggered && status.triggerNanoseconds && status.nowNanoseconds) {
    ofNow = std::clamp(nanoseconds(*status.nowNanoseconds - *status.triggerNanoseconds), nanoseconds(0), passed);
  }
  sums.residencies[sums.last.state] += passed - ofNow;
  sums.residencies[status.state] += ofNow;
  // A trigger that led to the same state again went through another one.
  if (changed || (triggered && status.triggerNanoseconds)) {
    ++sums.transitions[status.state];
  }
  sums.frames += steps(sums.last.hardwarePointer, status.hardwarePointer);
  if (status.overruns) {
    sums.overruns += steps(sums.last.overruns, status.overruns);
  } else if (status.state == kAlsaXrun && (changed || triggered)) {
    ++sums.overruns;
  }
  sums.last = status;
  sums.lastReading = now;
}

}  // namespace tarn::linux_host
