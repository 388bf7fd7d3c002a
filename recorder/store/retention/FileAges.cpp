// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/FileAges.h"

#include <sqlite3.h>

#include <string_view>

#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

int FileAges::read(Connection& connection) {
  files_.clear();
  changed_.clear();
  const Result<std::int64_t> tables =
      connection.readInteger("SELECT count(*) FROM sqlite_schema WHERE name = 'recorder_files' AND type = 'table'");
  if (tables.failed()) return static_cast<int>(tables.error->code);
  if (tables.value == 0) return SQLITE_OK;
  Statement rows;
  int code = rows.prepare(connection.handle(), "SELECT name, seconds FROM recorder_files");
  if (code != SQLITE_OK) return code;
  for (code = rows.step(); code == SQLITE_ROW; code = rows.step()) {
    files_[std::string(rows.text(0))] = {rows.real(1), false};
  }
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

int FileAges::write(Connection& connection) const {
  if (changed_.empty()) return SQLITE_OK;
  int code = connection.run("CREATE TABLE IF NOT EXISTS recorder_files(name TEXT PRIMARY KEY, seconds REAL)");
  Statement keep;
  Statement forget;
  code = code == SQLITE_OK ? keep.prepare(connection.handle(), "INSERT OR REPLACE INTO recorder_files VALUES(?1, ?2)")
                           : code;
  code = code == SQLITE_OK ? forget.prepare(connection.handle(), "DELETE FROM recorder_files WHERE name = ?1") : code;
  for (const std::string& name : changed_) {
    if (code != SQLITE_OK) break;
    const auto seen = files_.find(name);
    code = seen == files_.end() ? forget.bind(1, std::string_view(name)).run()
                                : keep.bind(1, std::string_view(name)).bind(2, seen->second.seconds).run();
  }
  return code;
}

double FileAges::firstSeen(const std::string& name, double now) {
  const auto [file, isNew] = files_.try_emplace(name, Seen{now});
  if (isNew) {
    changed_.insert(name);
  }
  file->second.isThere = true;
  return file->second.seconds;
}

void FileAges::forgetOthers() {
  for (auto file = files_.begin(); file != files_.end();) {
    if (!file->second.isThere) {
      changed_.insert(file->first);
      file = files_.erase(file);
    } else {
      file->second.isThere = false;
      ++file;
    }
  }
}

}  // namespace tarn::recorder
