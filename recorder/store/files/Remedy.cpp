// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/Remedy.h"

#include <sqlite3.h>

namespace tarn::recorder {

Remedy remedyFor(std::int64_t code) noexcept {
  if (code == SQLITE_READONLY_DBMOVED) return Remedy::Moved;
  switch (code & 0xFF) {
    case SQLITE_FULL:
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
      return Remedy::Wait;
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
    // Our statements are sound, so when one doesn't fit, the tables are no longer those that we made.
    case SQLITE_ERROR:
    case SQLITE_CONSTRAINT:
    case SQLITE_MISMATCH:
      return Remedy::SetAside;
    default:  // a read that failed, no memory: no word about the file
      return Remedy::Reopen;
  }
}

bool isShortage(std::int64_t code) noexcept {
  return (code & 0xFF) == SQLITE_NOMEM;
}

}  // namespace tarn::recorder
