// SPDX-License-Identifier: Apache-2.0
#include "fleet/export/BatchMaker.h"

#include <limits>
#include <utility>

#include "wire/Utf8.h"

namespace tarn::fleet {

namespace {

// What an event takes beside its texts, and no less.
constexpr std::size_t kEventBytes = 24;
constexpr std::size_t kSessionBytes = 512;
// Of one session in one batch; what is beyond comes with the next one that tells of it.
constexpr int kMostPeriods = 512;
constexpr std::size_t kMostRemembered = 65536;
// An id further from the batch's first has another batch.
constexpr std::int64_t kFurthest = std::numeric_limits<std::int32_t>::max();

}  // namespace

void BatchMaker::begin(std::int64_t after, std::int64_t lookedAt) {
  made_ = {};
  made_.batch.set_device(device_);
  made_.batch.set_looked_at(lookedAt);
  made_.batch.set_first(after + 1);
  made_.batch.set_last(after);
  bytes_ = 0;
  sessions_.clear();
  runs_.clear();
  kinds_.clear();
}

void BatchMaker::addGap(std::int64_t first, std::int64_t last) {
  v1::Gap& gap = *made_.batch.add_gaps();
  gap.set_first(first);
  gap.set_last(last);
  made_.batch.set_last(last);
}

Result<MadeBatch> BatchMaker::make(const std::vector<recorder::EventRow>& rows, std::int64_t after,
                                   std::int64_t lookedAt, StoredSessions& sessions) {
  begin(after, lookedAt);
  for (const recorder::EventRow& row : rows) {
    const bool isFull = bytes_ >= limits_.bytes || made_.batch.events_size() >= kMostRecords - 1 ||
                        made_.batch.gaps_size() >= kMostRecords - 1;
    if (isFull) break;
    const bool isFar = row.id - made_.batch.first() > kFurthest;
    if (isFar && made_.batch.last() >= made_.batch.first()) break;
    if (row.id > made_.batch.last() + 1) {
      addGap(made_.batch.last() + 1, row.id - 1);
    }
    if (isFar) break;
    if (Status added = addEvent(row, sessions); added.failed()) return {{}, std::move(added)};
    made_.batch.set_last(row.id);
  }
  return {std::move(made_), {}};
}

Result<MadeBatch> BatchMaker::makeAgain(const std::vector<recorder::EventRow>& rows, recorder::IdRange ids,
                                        bool isWhole, std::int64_t lookedAt, StoredSessions& sessions) {
  told_.clear();
  Result<MadeBatch> made = make(rows, ids.first - 1, lookedAt, sessions);
  v1::Batch& batch = made.value.batch;
  const bool hasAll = rows.empty() || batch.last() == rows.back().id;
  if (made.ok() && isWhole && hasAll && batch.last() < ids.last) {
    v1::Gap& gap = *batch.add_gaps();
    gap.set_first(batch.last() + 1);
    gap.set_last(ids.last);
    batch.set_last(ids.last);
  }
  return made;
}

Result<MadeBatch> BatchMaker::makeOfSessions(const std::vector<std::int64_t>& ids, std::int64_t after,
                                             std::int64_t lookedAt, StoredSessions& sessions) {
  begin(after, lookedAt);
  for (const std::int64_t id : ids) {
    if (made_.batch.sessions_size() >= kMostRecords) break;
    if (Result<Place> place = placeOf(id, sessions); place.failed()) return {{}, std::move(place.error)};
  }
  return {std::move(made_), {}};
}

Status BatchMaker::addEvent(const recorder::EventRow& row, StoredSessions& sessions) {
  const auto leaveOut = [this] { made_.batch.set_left_out(made_.batch.left_out() + 1); };
  const Result<Place> place = placeOf(row.session.value_or(0), sessions);
  if (place.failed()) return place.error;
  if (!place.value.isKept || !sieve_.allowsKind(row.backend, row.name)) {
    leaveOut();
    return {};
  }
  payload_.clear();
  const bool isWhole = sieve_.appendObject(payload_, row.payload) && wire::isUtf8(payload_) &&
                       payload_.size() <= limits_.recordBytes && row.detail.size() <= limits_.recordBytes &&
                       wire::isUtf8(row.name) && wire::isUtf8(row.backend);
  if (isWhole) {
    addRecord(row, place.value.number);
  } else {
    leaveOut();
  }
  return {};
}

void BatchMaker::addRecord(const recorder::EventRow& row, std::uint32_t session) {
  const std::uint32_t kind = kindOf(row);
  v1::Event& event = *made_.batch.add_events();
  event.set_ahead(static_cast<std::uint32_t>(row.id - made_.batch.first()));
  event.set_time(row.time);
  event.set_kind(kind);
  event.set_session(session);
  event.set_payload(payload_);
  bytes_ += payload_.size() + kEventBytes;
}

std::uint32_t BatchMaker::kindOf(const recorder::EventRow& row) {
  key_.assign(row.backend).append(1, '\0').append(row.name).append(1, '\0').append(row.detail);
  const auto [known, isNew] = kinds_.try_emplace(key_, made_.batch.kinds_size());
  if (isNew) {
    v1::Kind& kind = *made_.batch.add_kinds();
    kind.set_backend(row.backend);
    kind.set_name(row.name);
    std::string detail;
    // What can't be read of it stays.
    kind.set_detail(sieve_.appendObject(detail, row.detail) && wire::isUtf8(detail) ? detail : "{}");
    bytes_ += key_.size();
  }
  return static_cast<std::uint32_t>(known->second);
}

Result<BatchMaker::Place> BatchMaker::placeOf(std::int64_t session, StoredSessions& sessions) {
  if (const auto known = sessions_.find(session); known != sessions_.end()) return {known->second, {}};
  Place place;
  if (session == 0) {
    place.isKept = sieve_.allowsSession(device_, "", 0, 0);
  } else {
    Result<std::optional<StoredSession>> found = sessions.find(session);
    if (found.failed()) return {{}, std::move(found.error)};
    // One whose row is gone has events of nobody's.
    if (found.value) {
      const recorder::RunRow& run = found.value->run;
      place.isKept = sieve_.allowsSession(device_, run.boot, run.id, session);
      place.number = place.isKept ? addSession(*found.value) : 0;
    }
  }
  sessions_.emplace(session, place);
  return {place, {}};
}

std::uint32_t BatchMaker::addSession(const StoredSession& stored) {
  const recorder::SessionRow& row = stored.session;
  const std::uint32_t run = addRun(stored.run);
  v1::Session& session = *made_.batch.add_sessions();
  session.set_id(row.id);
  session.set_run(run);
  session.set_process(sieve_.textOf("process", row.process));
  session.set_application(sieve_.textOf("application", row.application));
  session.set_service_type(row.serviceType);
  session.set_service_name(row.serviceName);
  session.set_created(row.created);
  if (row.ended) {
    session.set_ended(*row.ended);
  }
  session.set_end_reason(row.endReason);
  addPeriods(stored.periods, session);
  const bool isWhole = session.periods_size() < kMostPeriods;
  if (!row.ended || !isWhole) {
    made_.open.push_back(row.id);
  }
  bytes_ += kSessionBytes;
  return static_cast<std::uint32_t>(made_.batch.sessions_size());
}

void BatchMaker::addPeriods(const std::vector<recorder::PeriodRow>& periods, v1::Session& session) {
  if (told_.size() >= kMostRemembered) {
    told_.clear();
  }
  std::int64_t& told = told_[session.id()];
  bool areOver = true;
  for (const recorder::PeriodRow& each : periods) {
    if (each.id <= told) continue;
    if (session.periods_size() >= kMostPeriods) return;
    v1::Period& period = *session.add_periods();
    period.set_id(each.id);
    period.set_started(each.started);
    if (each.stopped) {
      period.set_stopped(*each.stopped);
    }
    period.set_messages(each.messages);
    period.set_redundant(each.redundant);
    bytes_ += kEventBytes;
    areOver = areOver && each.stopped;
    if (areOver) {
      told = each.id;
    }
  }
}

std::uint32_t BatchMaker::addRun(const recorder::RunRow& row) {
  const auto [known, isNew] = runs_.try_emplace(row.id, static_cast<std::uint32_t>(made_.batch.runs_size()));
  if (isNew) {
    v1::Run& run = *made_.batch.add_runs();
    run.set_id(row.id);
    run.set_boot(row.boot);
    run.set_started(row.started);
    run.set_version(row.version);
    if (row.ended) {
      run.set_ended(*row.ended);
    }
    run.set_end_reason(row.endReason);
    std::string machine;
    run.set_machine(!row.machine.empty() && sieve_.appendObject(machine, row.machine) ? machine : "{}");
  }
  return known->second;
}

}  // namespace tarn::fleet
