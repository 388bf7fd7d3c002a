// SPDX-License-Identifier: Apache-2.0
#include "tools/report/RangePicture.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <optional>

#include "tools/report/Message.h"

namespace tarn::report {

namespace {

constexpr double kHour = 3600;
constexpr double kDay = 24 * kHour;
constexpr double kMostBins = 120;
// Up to here overloads are told by the hour.
constexpr double kLongestByTheHour = 3 * kDay;
constexpr std::size_t kWorst = 10;

// Whole hours or days that cover the range: as long as it takes to have few of them.
std::vector<TimeBin> binsOf(double from, double to, double unit) {
  std::vector<TimeBin> bins;
  if (!(to > from)) return bins;
  double length = unit;
  for (const double factor : {1.0, 7.0, 28.0, 364.0, 3640.0}) {
    length = unit * factor;
    if ((to - from) / length <= kMostBins) break;
  }
  length = std::max(length, std::ceil((to - from) / kMostBins / length) * length);
  for (double begin = std::floor(from / length) * length; begin < to; begin += length) {
    bins.push_back({begin, begin + length});
  }
  return bins;
}

std::int64_t faultsOf(const SessionFigures& figures) {
  return figures.overloads + figures.errors;
}

std::vector<GroupFigures> groupsOf(const std::vector<SessionFigures>& sessions) {
  std::map<std::pair<std::string, std::string>, GroupFigures> groups;
  for (const SessionFigures& figures : sessions) {
    GroupFigures& group = groups[{figures.session.application, figures.session.serviceName}];
    group.application = figures.session.application;
    group.serviceName = figures.session.serviceName;
    ++group.sessions;
    group.activeSeconds += figures.activeSeconds;
    group.overloads += figures.overloads;
    group.errors += figures.errors;
  }
  std::vector<GroupFigures> sorted;
  for (auto& entry : groups) {
    sorted.push_back(std::move(entry.second));
  }
  std::stable_sort(sorted.begin(), sorted.end(), [](const GroupFigures& a, const GroupFigures& b) {
    return a.sessions > b.sessions || (a.sessions == b.sessions && a.activeSeconds > b.activeSeconds);
  });
  return sorted;
}

std::vector<std::size_t> worstOf(const std::vector<SessionFigures>& sessions) {
  std::vector<std::size_t> worst;
  for (std::size_t index = 0; index < sessions.size(); ++index) {
    if (faultsOf(sessions[index]) > 0) {
      worst.push_back(index);
    }
  }
  std::stable_sort(worst.begin(), worst.end(),
                   [&](std::size_t a, std::size_t b) { return faultsOf(sessions[a]) > faultsOf(sessions[b]); });
  worst.resize(std::min(worst.size(), kWorst));
  return worst;
}

}  // namespace

void RangeBuilder::add(const SessionRow& session) {
  if (!places_.emplace(session.id, sessions_.size()).second) return;
  sessions_.push_back({session});
}

void RangeBuilder::add(const PeriodRow& period) {
  const auto place = places_.find(period.session);
  if (place == places_.end()) return;
  SessionFigures& figures = sessions_[place->second];
  const double end = period.stopped.value_or(figures.session.ended.value_or(now_));
  const double from = std::max(period.started, range_.since.value_or(period.started));
  const double to = std::min(end, range_.until.value_or(end));
  if (to < from) return;
  figures.activeSeconds += to - from;
  figures.messages += period.messages;
  figures.redundant += period.redundant;
  periods_.emplace_back(from, to);
}

void RangeBuilder::add(const EventRow& event) {
  const auto place = places_.find(event.session);
  if (place == places_.end()) return;
  if (event.time < range_.since.value_or(event.time)) return;
  if (range_.until && event.time >= *range_.until) return;
  const std::optional<Message> message = Message::of(event);
  if (!message) return;
  SessionFigures& figures = sessions_[place->second];
  switch (message->kind()) {
    case MessageKind::Overload:
      ++figures.overloads;
      overloads_.push_back(event.time);
      return;
    case MessageKind::Error:
      ++figures.errors;
      return;
    case MessageKind::Issue:
      ++figures.issues;
      return;
    case MessageKind::VolumeSegment: {
      const double volume = message->number("KvSessionVolume");
      const double seconds = message->number("play_seconds");
      if (!(volume >= 0 && std::isfinite(volume) && seconds > 0 && std::isfinite(seconds))) return;
      const double bucket = std::min(std::round(volume * 16), static_cast<double>(kVolumeBuckets - 1));
      playSeconds_[static_cast<std::size_t>(bucket)] += seconds;
      return;
    }
    default:
      return;
  }
}

void RangeBuilder::fill(std::vector<TimeBin>& bins) const {
  if (bins.empty()) return;
  const double length = bins.front().to - bins.front().from;
  const auto placeOf = [&](double time) {
    const double place = std::floor((time - bins.front().from) / length);
    return std::min(static_cast<std::size_t>(std::max(0.0, place)), bins.size() - 1);
  };
  for (const auto& [from, to] : periods_) {
    for (std::size_t index = placeOf(from); index <= placeOf(to); ++index) {
      bins[index].activeSeconds += overlap(from, to, bins[index].from, bins[index].to);
    }
  }
  for (const double time : overloads_) {
    ++bins[placeOf(time)].overloads;
  }
}

RangePicture RangeBuilder::picture() {
  RangePicture picture;
  double first = std::numeric_limits<double>::infinity();
  double last = -first;
  for (const SessionFigures& figures : sessions_) {
    first = std::min(first, figures.session.created);
    last = std::max(last, figures.session.ended.value_or(std::max(now_, figures.session.created)));
    picture.totals.activeSeconds += figures.activeSeconds;
    picture.totals.messages += figures.messages;
    picture.totals.redundant += figures.redundant;
    picture.totals.overloads += figures.overloads;
    picture.totals.errors += figures.errors;
    picture.totals.issues += figures.issues;
  }
  if (sessions_.empty()) {
    first = last = now_;
  }
  picture.from = std::max(first, range_.since.value_or(first));
  picture.to = std::max(picture.from, std::min(last, range_.until.value_or(last)));
  picture.sessions = sessions_;
  std::stable_sort(picture.sessions.begin(), picture.sessions.end(),
                   [](const SessionFigures& a, const SessionFigures& b) { return a.session.id > b.session.id; });
  picture.groups = groupsOf(picture.sessions);
  picture.worst = worstOf(picture.sessions);
  picture.playSeconds = playSeconds_;
  picture.days = binsOf(picture.from, picture.to, kDay);
  picture.hours = binsOf(picture.from, picture.to, picture.to - picture.from <= kLongestByTheHour ? kHour : kDay);
  fill(picture.days);
  fill(picture.hours);
  return picture;
}

}  // namespace tarn::report
