// SPDX-License-Identifier: Apache-2.0
#include "tools/report/StoreMoment.h"

#include <sqlite3.h>

namespace tarn::report {

Status StoreMoment::open() {
  switch (recorder::presenceOf(file_)) {
    case recorder::Presence::Refused:
      return recorder::refusalOf(file_);
    case recorder::Presence::Missing:
      return Error{0, file_.string() + " is not there"};
    case recorder::Presence::There:
      break;
  }
  bounds_.begin(file_);
  bool asItLies = false;
  const Status opened = recorder::openToRead(connection_, file_, bounds_, asItLies);
  if (opened.failed()) return about(*opened);
  if (connection_.run("BEGIN") != SQLITE_OK) return about(bounds_.lastError(connection_));
  return recorder::requireSessions(connection_, file_);
}

Status StoreMoment::each(const std::string& sql, const Bind& bind, const Take& take) {
  bounds_.begin(file_);
  recorder::Statement rows;
  if (rows.prepare(connection_.handle(), sql) != SQLITE_OK) return about(bounds_.lastError(connection_));
  bind(rows);
  int code = rows.step();
  for (; code == SQLITE_ROW; code = rows.step()) {
    take(rows);
  }
  if (code != SQLITE_DONE) return about(bounds_.lastError(connection_));
  return {};
}

}  // namespace tarn::report
