// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionOverview.h"

#include <algorithm>
#include <map>
#include <optional>
#include <utility>

#include "tools/ctl/sessions/SessionEvents.h"
#include "tools/ctl/sessions/SessionMessage.h"
#include "tools/ctl/terminal/JsonObject.h"

namespace tarn::ctl {

namespace {

using recorder::EventReader;
using recorder::EventRow;
using recorder::PeriodRow;
using recorder::SessionReader;
using recorder::SessionRow;

constexpr const char* kSummaryEvent = "sys.oxbow.tarnkit.Session_Generic.Summary";
// Beyond it, looking for each one's events takes longer than going through all.
constexpr std::size_t kFewSessions = 64;
constexpr const char* kOverload = R"("issue_type":"overload")";

// A session that was killed has periods that nobody closed.
double endOf(const PeriodRow& period, const SessionRow& session, double now) {
  return period.stopped.value_or(session.ended.value_or(now));
}

bool isRunning(const SessionOverview& overview) {
  return !overview.row.ended && !overview.periods.empty() && !overview.periods.back().stopped;
}

// A session of whose events some aren't counted yet.
struct Uncounted {
  SessionOverview* overview = nullptr;
  std::int64_t after = 0;  // those with greater ids
  MessageSieve sieve;
};
using UncountedSessions = std::map<std::int64_t, Uncounted>;  // by their ids

// What the newest summary says counts for all before it. When it was made at the end nothing comes after it, and of one
// that never ran there is nothing; else the events after it are `uncounted`.
Status countBySummary(SessionReader& reader, SessionOverview& overview, UncountedSessions& uncounted) {
  std::int64_t after = 0;
  bool isAtTheEnd = false;
  for (auto period = overview.periods.rbegin(); period != overview.periods.rend() && after == 0; ++period) {
    if (!period->stopped || !period->firstEvent || !period->lastEvent) continue;
    const auto row = reader.newest(overview.row.id, kSummaryEvent, *period->firstEvent, *period->lastEvent);
    if (row.failed()) return row.error;
    if (const auto summary = row.value ? messageOf(*row.value) : std::nullopt) {
      overview.overloads = summary->payload.get("overload_count").asInt64();
      after = summary->event;
      isAtTheEnd = overview.row.ended && period == overview.periods.rbegin();
    }
  }
  if (isAtTheEnd || overview.periods.empty()) return {};
  Uncounted& rest = uncounted[overview.row.id];
  rest.overview = &overview;
  rest.after = after;
  return {};
}

void countEvent(const EventRow& row, Uncounted& rest) {
  // Most have no such thing, which is seen without reading them.
  const bool isNews = rest.sieve.letsThrough(row) && row.payload.find(kOverload) != std::string::npos;
  const auto message = isNews ? messageOf(row) : std::nullopt;
  rest.overview->overloads += message && isOverload(*message) ? 1 : 0;
}

// Of few sessions one after the other; of many all events are gone through once.
Status countByEvents(const std::filesystem::path& file, UncountedSessions& uncounted) {
  if (uncounted.empty()) return {};
  EventReader reader(file);
  if (uncounted.size() > kFewSessions) {
    return eachEvent(reader, std::nullopt, 0, [&](EventRow&& row) {
      const auto rest = uncounted.find(row.session.value_or(0));
      if (rest != uncounted.end() && row.id > rest->second.after) {
        countEvent(row, rest->second);
      }
      return true;
    });
  }
  for (auto& [session, rest] : uncounted) {
    const Status read = eachEvent(reader, session, rest.after, [&rest = rest](EventRow&& row) {
      countEvent(row, rest);
      return true;
    });
    if (read.failed()) return read;
  }
  return {};
}

}  // namespace

std::string SessionOverview::state() const {
  if (!row.ended) return isRunning(*this) ? "running" : "open";
  return row.endReason;
}

Result<std::vector<SessionOverview>> overviewsOf(SessionReader& reader, std::vector<SessionRow> sessions, double now,
                                                 const ProgressHandler& progress) {
  Result<std::vector<SessionOverview>> made;
  if (sessions.empty()) return made;
  const std::int64_t first = sessions.front().id;
  const std::int64_t last = sessions.back().id;
  Result<std::vector<PeriodRow>> periods = reader.periods(first, last);
  if (periods.failed()) return {{}, periods.error};
  UncountedSessions uncounted;
  made.value.reserve(sessions.size());  // what isn't counted yet refers to them
  auto period = periods.value.begin();
  for (SessionRow& row : sessions) {
    SessionOverview overview;
    overview.row = std::move(row);
    period =
        std::find_if(period, periods.value.end(), [&](const auto& each) { return each.session >= overview.row.id; });
    for (; period != periods.value.end() && period->session == overview.row.id; ++period) {
      overview.active += std::max(0.0, endOf(*period, overview.row, now) - period->started);
      overview.messages += period->messages;
      overview.redundant += period->redundant;
      overview.periods.push_back(*period);
    }
    made.value.push_back(std::move(overview));
    made.error = countBySummary(reader, made.value.back(), uncounted);
    if (made.failed()) return made;
    if (progress) {
      progress(static_cast<double>(made.value.size()) / static_cast<double>(sessions.size()));
    }
  }
  made.error = countByEvents(reader.file(), uncounted);
  return made;
}

std::string overviewJson(const SessionOverview& overview) {
  const SessionRow& row = overview.row;
  JsonObject object;
  object.add("id", row.id).add("run", row.run).add("reporter", row.reporter).add("connection", row.connection);
  object.add("pid", row.pid).add("uid", row.uid).addOrNull("process", row.process);
  object.addOrNull("application", row.application).add("service_type", row.serviceType);
  object.addOrNull("service_name", row.serviceName).add("created", row.created).addOptional("ended", row.ended);
  object.addOrNull("end_reason", row.ended ? row.endReason : std::string());
  object.add("running", isRunning(overview)).add("active", overview.active);
  std::vector<std::string> periods;
  for (const PeriodRow& period : overview.periods) {
    JsonObject item;
    item.add("started", period.started).addOptional("stopped", period.stopped).add("messages", period.messages);
    item.add("redundant", period.redundant).addOptional("first_event", period.firstEvent);
    item.addOptional("last_event", period.lastEvent);
    periods.push_back(item.text());
  }
  object.addArray("periods", periods).add("messages", overview.messages).add("redundant", overview.redundant);
  return object.add("overloads", overview.overloads).text();
}

}  // namespace tarn::ctl
