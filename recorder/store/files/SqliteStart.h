// SPDX-License-Identifier: Apache-2.0
// SqliteStart: how SQLite works in this process. Threads: any.
#pragma once

namespace tarn::recorder {

// Before SQLite is asked for anything else; safe to repeat. From the first time on it keeps no statistics of its
// memory: nobody asks for them, and for them each of its allocations would take one lock of the whole process.
void startSqlite() noexcept;

}  // namespace tarn::recorder
