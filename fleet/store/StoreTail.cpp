// SPDX-License-Identifier: Apache-2.0
#include "fleet/store/StoreTail.h"

#include <utility>

namespace tarn::fleet {

Result<recorder::EventPage> StoreTail::read(std::int64_t after, std::size_t limit, std::optional<double> since) {
  recorder::EventQuery query;
  query.after = after;
  query.limit = limit;
  query.since = since;
  return events_.read(query);
}

Result<recorder::EventPage> StoreTail::readEarlier(std::int64_t after, std::size_t limit) {
  recorder::EventQuery query;
  query.after = after;
  query.limit = limit;
  return earlier_.read(query);
}

Status StoreTail::look() {
  sessions_ = std::make_unique<recorder::SessionReader>(file_);
  Status opened = sessions_->open();
  if (opened.failed()) {
    sessions_.reset();
  }
  return opened;
}

Result<std::optional<StoredSession>> StoreTail::find(std::int64_t id) {
  Result<std::optional<StoredSession>> found;
  if (!sessions_) return found;
  auto session = sessions_->session(id);
  if (session.failed() || !session.value) return {std::nullopt, session.error};
  auto run = sessions_->run(session.value->run);
  if (run.failed() || !run.value) return {std::nullopt, run.error};
  auto periods = sessions_->periods(id);
  if (periods.failed()) return {std::nullopt, periods.error};
  found.value = StoredSession{std::move(*session.value), std::move(*run.value), std::move(periods.value)};
  return found;
}

Result<StoreMark> StoreTail::markOf(std::int64_t run) {
  Result<StoreMark> mark;
  if (!sessions_) return mark;
  const auto row = sessions_->run(run);
  if (row.failed()) return {{}, row.error};
  if (row.value) {
    mark.value = {row.value->id, row.value->boot, row.value->started};
  }
  return mark;
}

}  // namespace tarn::fleet
