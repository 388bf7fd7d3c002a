// SPDX-License-Identifier: Apache-2.0
#include "tools/report/ReportMaker.h"

#include <algorithm>
#include <map>
#include <string>
#include <utility>

namespace tarn::report {

namespace {

// A session of which all fits into a small section.
constexpr std::int64_t kSmallMessages = 64;
constexpr std::size_t kMostSmall = 30;

using Ids = std::vector<std::int64_t>;

// Those with a section of their own: the worst, then the newest small ones.
Ids chosenOf(const RangePicture& range) {
  Ids ids;
  for (const std::size_t index : range.worst) {
    ids.push_back(range.sessions[index].session.id);
  }
  const std::size_t most = ids.size() + kMostSmall;
  for (const SessionFigures& figures : range.sessions) {
    if (ids.size() == most) break;
    const bool isThere = std::find(ids.begin(), ids.end(), figures.session.id) != ids.end();
    if (!isThere && figures.messages <= kSmallMessages) {
      ids.push_back(figures.session.id);
    }
  }
  return ids;
}

Ids withoutRepeats(const Ids& ids) {
  Ids once;
  for (const std::int64_t id : ids) {
    if (std::find(once.begin(), once.end(), id) == once.end()) {
      once.push_back(id);
    }
  }
  return once;
}

// The overview of these sessions; all that is read is of the range.
Result<RangePicture> rangeOf(ReportStore& store, const std::vector<SessionRow>& sessions, const TimeRange& range,
                             double now, const std::function<void(double)>& progress) {
  RangeBuilder builder(range, now);
  for (const SessionRow& session : sessions) {
    builder.add(session);
  }
  const Result<std::vector<PeriodRow>> periods = store.periods(range);
  if (periods.failed()) return {{}, periods.error};
  for (const PeriodRow& period : periods.value) {
    builder.add(period);
  }
  const Status counted = store.countedEvents(
      range, [&](const EventRow& event) { builder.add(event); }, progress);
  if (counted.failed()) return {{}, counted};
  return {builder.picture()};
}

// In the order of the ids.
Result<std::vector<SessionPicture>> picturesOf(ReportStore& store, const std::vector<SessionRow>& sessions,
                                               const Ids& ids, double now) {
  auto events = store.eventsOf(ids);
  if (events.failed()) return {{}, events.error};
  auto periods = store.periodsOf(ids);
  if (periods.failed()) return {{}, periods.error};
  std::map<std::int64_t, const SessionRow*> rows;
  for (const SessionRow& session : sessions) {
    rows[session.id] = &session;
  }
  Result<std::vector<SessionPicture>> pictures;
  for (const std::int64_t id : ids) {
    pictures.value.push_back(sessionPicture(*rows.at(id), periods.value[id], events.value[id], now));
    events.value.erase(id);
  }
  return pictures;
}

}  // namespace

Result<Report> makeReport(ReportStore& store, const ReportRequest& request, double now,
                          const std::function<void(double)>& progress) {
  Result<Report> made;
  made.value.made = now;
  Ids ids = withoutRepeats(request.sessions);
  const bool areNamed = !ids.empty();
  const auto sessions = areNamed ? store.sessionsOf(ids) : store.sessions(request.range);
  if (sessions.failed()) return {{}, sessions.error};
  for (const std::int64_t id : ids) {
    const auto isWanted = [&](const SessionRow& session) { return session.id == id; };
    if (std::none_of(sessions.value.begin(), sessions.value.end(), isWanted)) {
      return {{}, Error{0, "there is no session " + std::to_string(id)}};
    }
  }
  if (sessions.value.size() != 1 || !areNamed) {
    Result<RangePicture> range = rangeOf(store, sessions.value, request.range, now, progress);
    if (range.failed()) return {{}, range.error};
    made.value.range = std::move(range.value);
  }
  if (!areNamed) {
    ids = chosenOf(*made.value.range);
  }
  Result<std::vector<SessionPicture>> pictures = picturesOf(store, sessions.value, ids, now);
  if (pictures.failed()) return {{}, pictures.error};
  made.value.sessions = std::move(pictures.value);
  made.value.isComplete = areNamed;
  return made;
}

}  // namespace tarn::report
