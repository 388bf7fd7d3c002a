// SPDX-License-Identifier: Apache-2.0
// EventReader: reads what the recorder holds, while it is being written or when no service runs.
//
// Owner: a tool. Opens the file read-only and keeps no transaction open between two calls, so it never holds the log up
// for longer than one page. A file in a directory that can't be written to is read as it lies there when nobody else
// has it open. When the file is set aside or replaced, the reader goes on with the new one. The file isn't trusted:
// whatever it holds, it stays as it is, and a read ends with rows or an error after work that its bytes are worth.
// Threads: one at a time.
//
//   read(after 0) -> rows, lookedUpTo -> read(after that) ... more is false -> waitForChange() -> read() ...
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/StoreCheck.h"
#include "recorder/store/files/ChangeWatch.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

// One event, as it stands in the file.
struct EventRow {
  std::int64_t id = 0;
  double time = 0;  // epoch seconds
  std::string backend;
  std::string name;
  std::string payload;                       // JSON
  std::string detail;                        // JSON
  std::optional<std::int64_t> session = {};  // on whose behalf it was handed over: `sessions.id`
};

// Which events; all that is given must hold.
struct EventQuery {
  std::optional<std::string> backend;
  std::optional<std::string> nameGlob;  // see globMatches
  std::optional<std::int64_t> session;  // `sessions.id`
  // Epoch seconds, the first included, the second not.
  std::optional<double> since;
  std::optional<double> until;
  std::int64_t after = 0;  // events with greater ids
  // Rows of a page at the most.
  std::size_t limit = 1000;
};

// What a query found, all of one moment.
struct EventPage {
  bool missing = false;        // there is no file, or none with events in it yet: nothing else is told
  std::vector<EventRow> rows;  // by ascending id
  // Where the next query goes on: the id up to which events were looked at. Less than the query's `after` when the
  // file was replaced by one whose ids start again; its rows are then in this page.
  std::int64_t lookedUpTo = 0;
  bool more = false;         // the limit cut it short
  bool hasSessions = false;  // the file knows them; of one that doesn't no event is of any
};

class EventReader {
 public:
  // Opens nothing. The file need not be there yet.
  explicit EventReader(std::filesystem::path file);
  EventReader(const EventReader&) = delete;
  EventReader& operator=(const EventReader&) = delete;

  // The next page, by ascending id, of one state of the file. The error names the file: it can't be opened or refuses
  // this user, is damaged, or costs more to read than its bytes are worth. A later call tries again from the path.
  // Waits up to two seconds for a lock.
  Result<EventPage> read(const EventQuery& query);
  // Blocks until something was written since the last read, or until the time is up; whether there is reason to read.
  // Without the system's watches it looks at least five times a second.
  bool waitForChange(std::chrono::milliseconds timeout);

 private:
  // What tells one file at the path from the next.
  struct Identity {
    bool there = false;
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    std::int64_t size = 0;  // of a file read as it lies there: any change means another content
    std::int64_t modified = 0;
    bool hasLog = false;
    friend bool operator==(const Identity&, const Identity&) = default;
  };

  // Of the file at the path now; asks the system, not the database.
  Identity identity() const;
  // Of one that is read as it lies there any change makes another file of it.
  bool sameFile(const Identity& now) const noexcept;
  // Whether the file is another, or somebody committed to it.
  bool changed();
  // As a reader beside the writer, or as the file lies there.
  [[nodiscard]] Status open();
  // Opens a name and reads from it once, as only that shows whether it can be read. Nothing that the file's schema says
  // is carried out.
  [[nodiscard]] Status openAs(const std::string& name);
  void setBounds();  // of the read that begins
  // Why the connection's last call failed, or that the read cost too much.
  Error lastError() const;
  // Every error names the file.
  Error about(const std::string& what) const { return {0, file_.string() + ": " + what}; }
  // The id to read on after: less than what was asked for when the file began anew.
  std::int64_t startingPoint(std::int64_t after);
  // In one transaction, which is over when it returns.
  Result<EventPage> readOpen(const EventQuery& query);
  // The rows, within the bounds of this read.
  [[nodiscard]] Status readRows(const EventQuery& query, std::int64_t after, EventPage& page);
  [[nodiscard]] Status readFrom(Statement& rows, const IdRange& ids, std::size_t limit, EventPage& page);

  const std::filesystem::path file_;
  // Open from one read to the next, as long as the file stays the same.
  Connection connection_;
  // Of the folder, for waitForChange().
  ChangeWatch watch_;
  // Of the file that is open, as it was then.
  Identity opened_;
  bool asItLies_ = false;             // opened without locks and log
  std::optional<Identity> lastRead_;  // the file of the last rows, nothing before the first ones
  // SQLite's word for the state that was read last; another number after somebody's commit.
  std::int64_t dataVersion_ = -1;
  // Both of the read that goes on: SQLite asks for the first every thousand steps.
  std::int64_t stepsLeft_ = 0;  // of SQLite's machine
  std::int64_t textLeft_ = 0;   // bytes
};

}  // namespace tarn::recorder
