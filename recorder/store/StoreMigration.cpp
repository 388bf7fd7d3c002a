// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/StoreMigration.h"

#include <sqlite3.h>

#include <limits>
#include <string>

#include "recorder/store/StoreLayout.h"
#include "recorder/store/rows/EventTable.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

namespace {

constexpr const char* kSome =
    "SELECT id, time, backend, name, payload, detail FROM older_events WHERE id > ?1 ORDER BY id LIMIT 4096";
constexpr const char* kRemove = "DELETE FROM older_events WHERE id <= ?1";

// Rows after `last` into the table, a few thousand; `last` is then the last of them, and `moved` counts them.
int moveSome(Statement& some, EventTable& table, std::int64_t& last, std::int64_t& moved) {
  std::string payload;
  bool hasPayload = false;
  some.bind(1, last);
  int code = some.step();
  for (; code == SQLITE_ROW; code = some.step()) {
    const StoredEvent event{some.real(1), some.text(2), some.text(3), some.text(4), some.text(5)};
    const bool repeats = hasPayload && event.payload == payload;
    last = some.integer(0);
    ++moved;
    code = table.insert(last, event, repeats);
    if (code != SQLITE_OK) break;
    if (!repeats) {
      payload = event.payload;
      hasPayload = true;
    }
  }
  some.reset();
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

int moveAll(Connection& connection, std::int64_t& moved) {
  Statement some;
  Statement remove;
  EventTable table;
  int code = some.prepare(connection.handle(), kSome);
  if (code == SQLITE_OK) {
    code = remove.prepare(connection.handle(), kRemove);
  }
  if (code == SQLITE_OK) {
    code = table.prepare(connection);
  }
  std::int64_t before = -1;
  std::int64_t last = std::numeric_limits<std::int64_t>::min();
  while (code == SQLITE_OK && moved != before) {
    before = moved;
    code = moveSome(some, table, last, moved);
    if (code == SQLITE_OK) {
      code = remove.bind(1, last).run();
    }
  }
  return code;
}

}  // namespace

Result<std::int64_t> migrate(Connection& connection) {
  std::int64_t moved = 0;
  int code = connection.run(("BEGIN IMMEDIATE; ALTER TABLE events RENAME TO older_events;" + currentTables()).c_str());
  if (code == SQLITE_OK) {
    code = moveAll(connection, moved);
  }
  if (code == SQLITE_OK) {
    code = connection.run(("DROP TABLE older_events;" + currentViews() + "COMMIT").c_str());
  }
  Status error = connection.errorOf(code);
  if (error.failed()) {
    connection.rollback();
  }
  return {moved, error};
}

}  // namespace tarn::recorder
