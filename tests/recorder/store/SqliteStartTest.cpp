// SPDX-License-Identifier: Apache-2.0
// A program of its own: what SQLite counts is settled once a process.
#include "recorder/store/files/SqliteStart.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cstdint>

#include "recorder/store/files/MappedGuard.h"
#include "recorder/store/rows/Connection.h"

namespace tarn::recorder {
namespace {

std::int64_t bytesCountedByAConnection() {
  Connection connection;
  EXPECT_EQ(connection.open(":memory:", SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE), SQLITE_OK);
  EXPECT_EQ(connection.run("CREATE TABLE t(a); INSERT INTO t VALUES(zeroblob(1000))"), SQLITE_OK);
  EXPECT_EQ(connection.integer("SELECT length(a) FROM t"), 1000);
  return sqlite3_memory_used();
}

TEST(SqliteStart, MemoryIsNotCountedForAConnection) {
  EXPECT_EQ(bytesCountedByAConnection(), 0);
}

TEST(SqliteStart, MemoryIsNotCountedWhereMappingsAreGuardedFirst) {
  MappedGuard::guardSqlite();
  EXPECT_EQ(bytesCountedByAConnection(), 0);
}

}  // namespace
}  // namespace tarn::recorder
