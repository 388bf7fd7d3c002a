// SPDX-License-Identifier: Apache-2.0
// What EventFile takes over from a file that was set aside.
#include <sqlite3.h>

#include "recorder/store/EventFile.h"
#include "recorder/store/retention/RemovedIds.h"

namespace tarn::recorder {

Status EventFile::carry(std::int64_t id, double seconds, const StoredEvent& event, bool repeatsPayload) {
  if (id != group_.end() || seconds != group_.seconds()) {
    if (auto error = rollbackAfter(writeGroup()); error.failed()) return error;
    group_.begin(id, seconds);
  }
  skipTo(id);
  nextId_ = lastId_ + 1;
  retention_.forgetShares();
  return insertAs(id, event, repeatsPayload, true);
}

Status EventFile::carrySessions(Connection& from, std::int64_t& leftBehind) {
  return rollbackAfter(SessionTable::carry(from, connection_, leftBehind));
}

Status EventFile::noteLoss(const IdRange& lost) {
  Statement insert;
  int code = insert.prepare(connection_.handle(), "INSERT OR REPLACE INTO recorder_losses VALUES(?1, ?2)");
  if (code == SQLITE_OK) {
    code = insert.bind(1, lost.first).bind(2, lost.last).run();
  }
  // The next one to open the file must not miss them again.
  if (code == SQLITE_OK) {
    code = keepLastId_.bind(1, lastId_).run();
  }
  return rollbackAfter(code);
}

Status EventFile::noteRemoved(const IdRange& removed) {
  RemovedIds ids;
  ids.prepare(connection_);
  return rollbackAfter(ids.add(removed));
}

Status EventFile::noteCarried(std::int64_t first) {
  Statement note;
  int code = note.prepare(connection_.handle(),
                          "INSERT OR REPLACE INTO recorder_state "
                          "VALUES('holds_after', ?1 - 1), ('begun_after', ?2), ('last_id', ?2)");
  if (code == SQLITE_OK) {
    code = note.bind(1, first).bind(2, lastId_).run();
  }
  return rollbackAfter(code);
}

}  // namespace tarn::recorder
