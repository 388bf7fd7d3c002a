// SPDX-License-Identifier: Apache-2.0
#include "adapters/alsa/SubDeviceBook.h"

#include <algorithm>
#include <set>
#include <string_view>
#include <utility>

namespace tarn::streams {

namespace {

using linux_host::AlsaStatus;

constexpr std::uint64_t kMostMissed = 1000;  // cycles that are counted between two looks

std::string_view nameOfState(const AlsaStatus& status) {
  return linux_host::kAlsaStates[status.state];
}

bool isPlaying(const AlsaStatus& status) {
  return nameOfState(status) == "RUNNING" || nameOfState(status) == "DRAINING";
}

// When the state began: as long ago as the kernel says, by whatever clock, else now.
Moment sinceOf(const AlsaStatus& status, Moment at) {
  if (!status.triggerNanoseconds || !status.nowNanoseconds) return at;
  return at - std::max<Moment>(*status.nowNanoseconds - *status.triggerNanoseconds, 0);
}

// As PipeWire calls it: S16LE of S16_LE.
std::string formatName(std::string name) {
  for (const auto& [theirs, ours] : {std::pair("FLOAT64", "F64"), std::pair("FLOAT", "F32")}) {
    if (name.rfind(theirs, 0) == 0) {
      name.replace(0, std::string_view(theirs).size(), ours);
    }
  }
  name.erase(std::remove(name.begin(), name.end(), '_'), name.end());
  return name;
}

NodeFacts deviceFacts(const OpenSubDevice& now) {
  return {NodeState::Running,
          {},
          {{"media.class", now.isPlayback ? "Audio/Sink" : "Audio/Source"},
           {"node.name", now.name},
           {"device.api", "alsa"},
           {"device.bus", now.isUsb ? "usb" : ""},
           {"device.profile.name", now.isDigital ? "digital" : ""}}};
}

NodeFacts streamFacts(const OpenSubDevice& now, bool runs) {
  NodeFacts facts{runs ? NodeState::Running : NodeState::Idle,
                  {},
                  {{"media.class", now.isPlayback ? "Stream/Output/Audio" : "Stream/Input/Audio"},
                   {"node.name", now.name},
                   {"application.process.binary", now.owner.program}}};
  if (now.owner.process != 0) {
    facts.properties["application.process.id"] = std::to_string(now.owner.process);
  }
  return facts;
}

}  // namespace

void SubDeviceBook::looked(const std::vector<OpenSubDevice>& open, Moment at) {
  std::set<std::string> names;
  for (const OpenSubDevice& now : open) {
    names.insert(now.name);
    const auto found = known_.find(now.name);
    if (found != known_.end() && found->second.last.owner != now.owner) {
      leave(found->second, at);
      known_.erase(found);
    }
    follow(enter(now, at), now, at);
  }
  for (auto known = known_.begin(); known != known_.end();) {
    if (names.count(known->first) != 0) {
      ++known;
      continue;
    }
    leave(known->second, at);
    known = known_.erase(known);
  }
  book_.settle();
}

SubDeviceBook::Known& SubDeviceBook::enter(const OpenSubDevice& now, Moment at) {
  const auto [entry, isNew] = known_.try_emplace(now.name);
  Known& known = entry->second;
  if (!isNew) return known;
  known.device = ++lastId_;
  known.stream = ++lastId_;
  known.link = ++lastId_;
  known.last = now;
  book_.nodeKnown(known.device, at, deviceFacts(now));
  book_.nodeKnown(known.stream, at, streamFacts(now, false));
  const ObjectId ends[] = {known.stream, known.device};
  book_.linkKnown(known.link, at, {ends[now.isPlayback ? 0 : 1], ends[now.isPlayback ? 1 : 0], false, {}});
  return known;
}

void SubDeviceBook::leave(const Known& known, Moment at) {
  book_.removed(known.stream, at);
  book_.removed(known.device, at);
}

void SubDeviceBook::follow(Known& known, const OpenSubDevice& now, Moment at) {
  if (now.parameters && (!known.runs || now.parameters != known.last.parameters)) {
    book_.formatKnown(known.stream, at,
                      FormatFacts{formatName(now.parameters->format), now.parameters->rate, now.parameters->channels});
  }
  const bool isDry = known.runs && now.status.state == linux_host::kAlsaXrun;
  const bool isOther = now.status.triggerNanoseconds != known.last.status.triggerNanoseconds;
  // What the kernel tells of a start or a stop is of the last one.
  const Moment since = isOther || !known.runs ? sinceOf(now.status, at) : at;
  if (!isPlaying(now.status) && !isDry) {
    setState(known, false, since);
  } else if (isDry) {
    if (!std::exchange(known.isDry, true)) {
      tellCycle(known, false, since);
    }
  } else if (!known.runs) {
    known.last = now;
    setState(known, true, since);
  } else if (isOther) {
    followRun(known, now, since);
  }
  known.last = now;
}

// It was started again since the last look.
void SubDeviceBook::followRun(Known& known, const OpenSubDevice& now, Moment since) {
  const std::uint64_t before = known.last.status.overruns.value_or(0);
  const std::uint64_t after = now.status.overruns.value_or(0);
  const bool wasDry = std::exchange(known.isDry, false);
  std::uint64_t missed = std::min(after > before ? after - before : 0, kMostMissed);
  known.last = now;
  if (missed == 0 && !wasDry) {
    setState(known, false, since);
    book_.settle();
    setState(known, true, since);
    return;
  }
  for (missed -= missed > 0 && wasDry ? 1 : 0; missed > 0; --missed) {
    tellCycle(known, false, since);
  }
  tellCycle(known, true, since);
}

void SubDeviceBook::setState(Known& known, bool runs, Moment at) {
  if (known.runs == runs) return;
  known.runs = runs;
  known.isDry = false;
  book_.nodeKnown(known.stream, at, streamFacts(known.last, runs));
  if (runs) {
    book_.settle();
    tellCycle(known, true, at);
  }
}

void SubDeviceBook::tellCycle(const Known& known, bool isMet, Moment at) {
  if (!known.last.parameters) return;
  const auto count = static_cast<std::int64_t>(known.last.status.overruns.value_or(0));
  CycleFacts cycle{known.device, count, at, known.last.parameters->periodFrames, known.last.parameters->rate, 0, {}};
  cycle.followers.push_back({known.stream, isMet, known.last.parameters->bufferFrames});
  book_.cycleSeen(cycle);
}

}  // namespace tarn::streams
