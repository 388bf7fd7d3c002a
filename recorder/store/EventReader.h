// EventReader: reads what the recorder holds, while it is being written or when no service runs.
//
// Owner: a tool. Opens the file read-only and keeps no transaction open between two calls. A file in a directory that
// can't be written to is read as it lies there when nobody else has it open. When the file is set aside or replaced,
// the reader goes on with the new one. The file isn't trusted: whatever it holds, it stays as it is, and a read ends
// with rows or an error after work that its bytes are worth. Threads: one at a time.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/ChangeWatch.h"
#include "recorder/store/Connection.h"

namespace tarn::recorder {

struct EventRow {
  std::int64_t id = 0;
  double time = 0;  // epoch seconds
  std::string backend;
  std::string name;
  std::string payload;  // JSON
  std::string detail;   // JSON
};

struct EventQuery {
  std::optional<std::string> backend;
  std::optional<std::string> nameGlob;  // see globMatches
  std::int64_t after = 0;               // events with greater ids
  std::size_t limit = 1000;
};

// What a query found.
struct EventPage {
  bool missing = false;        // there is no file, or none with events in it yet: nothing else is told
  std::vector<EventRow> rows;  // by ascending id
  // Where the next query goes on: the id up to which events were looked at. Less than the query's `after` when the
  // file was replaced by one whose ids start again; its rows are then in this page.
  std::int64_t lookedUpTo = 0;
  bool more = false;  // the limit cut it short
};

class EventReader {
 public:
  explicit EventReader(std::filesystem::path file);
  EventReader(const EventReader&) = delete;
  EventReader& operator=(const EventReader&) = delete;

  // The error names the file.
  Result<EventPage> read(const EventQuery& query);
  // Waits until something was written since the last read, or until the time is up; whether there is reason to read.
  bool waitForChange(std::chrono::milliseconds timeout);

 private:
  struct Identity {
    bool there = false;
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    std::int64_t size = 0;  // of a file read as it lies there: any change means another content
    std::int64_t modified = 0;
    bool hasLog = false;
    friend bool operator==(const Identity&, const Identity&) = default;
  };

  Identity identity() const;
  bool sameFile(const Identity& now) const noexcept;
  bool changed();
  [[nodiscard]] Status open();
  [[nodiscard]] Status openAs(const std::string& name);
  void setBounds();  // of the read that begins
  Error lastError() const;
  Error about(const std::string& what) const { return {0, file_.string() + ": " + what}; }
  std::int64_t startingPoint(std::int64_t after);
  Result<EventPage> readOpen(const EventQuery& query);
  [[nodiscard]] Status readRows(const EventQuery& query, std::int64_t after, EventPage& page);

  const std::filesystem::path file_;
  Connection connection_;
  ChangeWatch watch_;
  Identity opened_;
  bool asItLies_ = false;             // opened without locks and log
  std::optional<Identity> lastRead_;  // the file of the last rows, nothing before the first ones
  std::int64_t dataVersion_ = -1;
  std::int64_t stepsLeft_ = 0;  // of SQLite's machine
  std::int64_t textLeft_ = 0;   // bytes
};

}  // namespace tarn::recorder
