// SPDX-License-Identifier: Apache-2.0
// GroupWriter: writes batches to the database, a group in one transaction: all of it is there afterwards, or nothing.
// What is there already is passed over, so a batch may come as often as it likes, in any order, by any number of
// writers.
//
//   known devices, runs, days | BEGIN, COPY to the side, events with their hours, what was told, sessions, COMMIT
//
// What every group of a device touches, the rows of its runs and sessions, comes last: others wait for it no longer
// than a commit takes.
//
// Owner: a collector. It is made for one connection of a database whose layout is the present one. Threads: one.
#pragma once

#include <cstdint>
#include <vector>

#include "fleet/collect/Database.h"
#include "fleet/collect/GroupRows.h"

namespace tarn::fleet {

struct WrittenGroup {
  std::int64_t events = 0;            // those that weren't there before
  std::int64_t records = 0;           // in all
  std::vector<std::int32_t> devices;  // the database's numbers of those that they are of
};

class GroupWriter {
 public:
  explicit GroupWriter(Database& database) : database_(database) {}

  // After the connection was opened.
  [[nodiscard]] Status begin();
  // The error's code is the database's (see Database.h).
  Result<WrittenGroup> write(const std::vector<const v1::Batch*>& batches);
  // Drops the days before one, as 2026-11-20, and tells how many.
  Result<int> forgetBefore(const std::string& day);

 private:
  [[nodiscard]] Status learnDevices(GroupRows& rows);
  [[nodiscard]] Status learnRuns(GroupRows& rows);
  [[nodiscard]] Status makeDays(const std::vector<std::string>& days);
  [[nodiscard]] Status fill(const char* table, CopyRows rows);
  [[nodiscard]] Status fillAll(const GroupRows& rows);
  Result<std::int64_t> addEvents(const std::vector<std::string>& days);
  Result<WrittenGroup> writeOnce(GroupRows& rows);

  Database& database_;
  // Of the rows of hours that are this writer's alone.
  std::string keeper_;
};

}  // namespace tarn::fleet
