// SPDX-License-Identifier: Apache-2.0
// CursorFile: remembers on disk up to which record everything was acknowledged. It never stands before a record that
// wasn't: what comes after it is sent again, and known again where it arrives.
//
//   tarnreporting-export 1 EVENT LOOKED_AT RUN STARTED BOOT OPEN HASH     the state
//   tarnreporting-export 1 ...                                            that before
//
// Written beside its place, synchronised and renamed. A line that was damaged afterwards is passed over: the one before
// is good too, as is the beginning of the store where neither is whole. Threads: one.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "fleet/store/StoreTail.h"
#include "plist/Result.h"

namespace tarn::fleet {

struct Cursor {
  std::int64_t event = 0;          // the last id of which everything arrived
  std::int64_t lookedAt = 0;       // of the last batch, microseconds; later ones are later
  StoreMark mark;                  // of the store that the id is of
  std::vector<std::int64_t> open;  // sessions that hadn't ended when they were told of
  friend bool operator==(const Cursor&, const Cursor&) = default;
};

// What was read, and a word about it where it isn't the newest; empty: nothing is wrong.
struct ReadCursor {
  Cursor cursor;
  std::string remark;
};

class CursorFile {
 public:
  explicit CursorFile(std::string path) : path_(std::move(path)) {}

  // Of a file that isn't there, the beginning. The error is that of a disk or of a folder that refuses.
  Result<ReadCursor> read();
  // On the disk when it returns; on an error what was there still is.
  [[nodiscard]] Status write(const Cursor& cursor);

 private:
  const std::string path_;
  std::string newest_;  // the line
};

}  // namespace tarn::fleet
