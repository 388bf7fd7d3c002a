// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/SqliteStart.h"

#include <sqlite3.h>

namespace tarn::recorder {

void startSqlite() noexcept {
  // Refused where somebody has started it already, which then goes on as it was.
  [[maybe_unused]] static const int once = sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0);
  sqlite3_initialize();
}

}  // namespace tarn::recorder
