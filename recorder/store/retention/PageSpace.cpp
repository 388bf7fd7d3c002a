// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/PageSpace.h"

#include <sqlite3.h>

#include <algorithm>
#include <string>

namespace tarn::recorder {

namespace {

// A few milliseconds' worth.
constexpr std::int64_t kPagesAtOnce = 64;

int readPragma(Statement& pragma, std::int64_t& value) {
  const int code = pragma.step();
  if (code == SQLITE_ROW) {
    value = pragma.integer(0);
  }
  pragma.reset();
  return code == SQLITE_ROW ? SQLITE_OK : code;
}

}  // namespace

int PageSpace::prepare(Connection& connection) {
  connection_ = &connection;
  pageBytes_ = connection.integer("PRAGMA page_size").value_or(4096);
  const int code = pageCount_.prepare(connection.handle(), "PRAGMA page_count", true);
  return code == SQLITE_OK ? freePages_.prepare(connection.handle(), "PRAGMA freelist_count", true) : code;
}

void PageSpace::finalize() noexcept {
  pageCount_.finalize();
  freePages_.finalize();
}

int PageSpace::read(Bytes& bytes) {
  std::int64_t pages = 0;
  std::int64_t freePages = 0;
  int code = readPragma(pageCount_, pages);
  if (code == SQLITE_OK) {
    code = readPragma(freePages_, freePages);
  }
  bytes = {pages * pageBytes_, (pages - freePages) * pageBytes_};
  return code;
}

int PageSpace::giveBack(std::int64_t maxBytes, bool& gaveAny) {
  Bytes bytes;
  gaveAny = false;
  const int code = read(bytes);
  if (code != SQLITE_OK || bytes.file <= maxBytes || bytes.file == bytes.used) return code;
  const std::int64_t excess = (std::min(bytes.file - maxBytes, bytes.file - bytes.used) + pageBytes_ - 1) / pageBytes_;
  const std::string pragma = "PRAGMA incremental_vacuum(" + std::to_string(std::min(excess, kPagesAtOnce)) + ")";
  const int vacuumed = connection_->run(pragma.c_str());
  if (vacuumed != SQLITE_OK) return vacuumed;
  Bytes left;
  const int again = read(left);
  // A file that was made without the page map can't shrink; its free pages are used again all the same.
  gaveAny = left.file < bytes.file;
  return again;
}

}  // namespace tarn::recorder
