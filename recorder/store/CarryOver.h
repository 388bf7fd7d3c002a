// SPDX-License-Identifier: Apache-2.0
// CarryOver: brings what can still be read of a file that was set aside into the fresh one, under its own ids.
//
// Rows that are as their checksum says are carried, and rows that nothing proves; where a page can't be read it goes on
// after it. The old file isn't trusted: reading it ends after work that its bytes are worth, and it stays as it is.
// When the fresh file fails, it is gone on with later. Owner: the event writer. Threads: the writer's.
//
// What a row is worth is told by its group: proven rows keep the time of their group and so their age, the others count
// as of now. A row whose checksum says otherwise is left behind, and its id noted as lost.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/EventFile.h"
#include "recorder/store/retention/IdRange.h"
#include "recorder/store/retention/RemovedIds.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/EventGroup.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

class CarryOver {
 public:
  // `from` is the file under its new name. With a bound only events up to this id: those after it will be written
  // again. Nothing is opened yet.
  CarryOver(std::filesystem::path from, std::optional<std::int64_t> upTo) : from_(std::move(from)), upTo_(upTo) {}
  CarryOver(const CarryOver&) = delete;
  CarryOver& operator=(const CarryOver&) = delete;

  // Carries all of it, in transactions of 1024 rows, and at the end notes which ids are lost and where the file's ids
  // begin. An error is one of the fresh file, and the call may be repeated: what was committed isn't carried twice.
  // What can't be read of the old file is no error.
  [[nodiscard]] Status goOn(EventFile& into);

  const std::filesystem::path& from() const noexcept { return from_; }
  // Events so far.
  std::int64_t carried() const noexcept { return carried_; }
  // Ids that the old file should have held, as far as that is known; complete after goOn().
  const std::vector<IdRange>& lost() const noexcept { return lost_; }
  // Rows of sessions and the like that weren't as they were written; complete after goOn().
  std::int64_t leftBehind() const noexcept { return leftBehind_; }

 private:
  // A row between the two files.
  struct Read {
    std::int64_t id;
    // Of its group, on the recorder's own time.
    double seconds;
    double time;
    std::string backend;
    std::string name;
    std::string payload;
    std::string detail;
    std::int64_t session;
  };

  // Opens the old file read-only, trusting nothing of its schema; one that can't be opened or isn't a recorder's has no
  // rows.
  void open(const EventFile& into);
  // The greatest id that may be one of ours: one that lies 2^24 beyond all that is known is damage.
  std::int64_t lastToLookFor(std::int64_t known);
  // The next rows into some_; false when there are no more.
  bool readSome(double now);
  // Keeps the row unless its checksum, or the kinds of its values, say that it isn't as it was written.
  void readRow(double now);
  // Those rows in one transaction, and what their ids tell of others that are missing.
  [[nodiscard]] Status writeSome(EventFile& into);
  // These aren't there: lost, but for those that retention removed.
  void miss(IdRange gap);
  // The notes, and the ids of the fresh file go on after the old one's.
  [[nodiscard]] Status finish(EventFile& into);

  // Both as given.
  const std::filesystem::path from_;
  const std::optional<std::int64_t> upTo_;
  Connection connection_;
  // Both look things up in the old file: rows after an id, and the group in which an id may lie.
  Statement rows_;
  Statement groups_;
  RemovedIds removedIds_;
  EventGroup group_;
  // Read and not committed yet; kept over a failure of the fresh file.
  std::vector<Read> some_;
  // In rising order, as far as it has come.
  std::vector<IdRange> lost_;
  std::vector<IdRange> removed_;
  // Of SQLite's machine: a tree that leads into itself ends with these.
  std::int64_t stepsLeft_ = 0;
  // How far it is: opened, however that went, and read to the end.
  bool opened_ = false;
  bool ended_ = false;
  std::int64_t after_ = 0;   // looked at up to here
  std::int64_t last_ = 0;    // nothing is looked for beyond
  std::int64_t wanted_ = 0;  // the id that should come next; 0 when nothing tells
  std::int64_t first_ = 0;   // carried, 0 for none
  std::int64_t carried_ = 0;
  std::int64_t leftBehind_ = 0;
};

}  // namespace tarn::recorder
