// SPDX-License-Identifier: Apache-2.0
// SessionReader: looks at the sessions that the recorder holds: runs, sessions and their periods. What was handed over
// on a session's behalf is EventReader's.
//
// Owner: a tool. Opens the file read-only; all that one object tells is of one moment, that of open(), so it is made
// for one look and not kept: meanwhile the log of the file can't be brought into it. How a file is opened and what a
// read of it may cost: StoreAccess. Threads: one.
//
//   SessionReader reader(file); reader.open() -> sessions(...) -> periods(id), newest(id, ...)
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/reading/EventReader.h"
#include "recorder/store/reading/StoreAccess.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

// All times are epoch seconds. What hasn't happened yet isn't there; texts that nobody told are empty.

// One run of the service.
struct RunRow {
  std::int64_t id = 0;
  std::string boot;
  std::string version;
  double started = 0;
  std::optional<double> ended;
  std::string endReason;
  std::string machine;  // a JSON object; empty: the run was before that was noted
};

struct SessionRow {
  std::int64_t id = 0;
  std::int64_t run = 0;
  std::int64_t reporter = 0;
  std::int64_t connection = 0;  // the service's number of it, 0 for none
  std::int64_t pid = 0;
  std::int64_t uid = 0;
  std::string process;
  std::string application;
  std::int64_t serviceType = 0;
  std::string serviceName;
  double created = 0;
  std::optional<double> ended;
  std::string endReason;  // stopped, destroyed, replaced, retyped, client-gone, service-stopping, killed
};

// From a start to its stop.
struct PeriodRow {
  std::int64_t id = 0;
  std::int64_t session = 0;
  double started = 0;
  std::optional<double> stopped;
  std::int64_t messages = 0;   // that came, repeated and derived ones included
  std::int64_t redundant = 0;  // of them
  // The ids of its first and last event; nothing when there is none.
  std::optional<std::int64_t> firstEvent;
  std::optional<std::int64_t> lastEvent;
};

// A message that repeated an earlier one, where such are kept.
struct RepeatedRow {
  std::int64_t id = 0;
  std::optional<std::int64_t> period;
  double time = 0;                    // when it came
  std::optional<double> stamp;        // its own
  std::optional<std::int64_t> event;  // whose message it repeats; nothing where that isn't known
  std::int64_t afterEvent = 0;        // the last event, of anybody's, that was handed over before it
};

// Which sessions; all that is given must hold.
struct SessionQuery {
  // Epoch seconds: sessions that were there at any time from the one to before the other.
  std::optional<double> since;
  std::optional<double> until;
  std::optional<std::string> applicationGlob;  // see globMatches
  bool open = false;                           // only those that haven't ended
  bool used = false;                           // only those of kIsUsed
  std::optional<std::size_t> limit;            // the newest so many
};

// What holds of a row of `sessions` unless a change of its type made another one in its place before it ever ran: most
// clients make a session and then say what it is for.
inline constexpr std::string_view kIsUsed =
    "(end_reason IS NOT 'retyped' OR EXISTS (SELECT 1 FROM periods WHERE session = sessions.id))";

class SessionReader {
 public:
  // Opens nothing. There is no need for the file to be there.
  explicit SessionReader(std::filesystem::path file) : file_(std::move(file)) {}
  SessionReader(const SessionReader&) = delete;
  SessionReader& operator=(const SessionReader&) = delete;

  // Opens the file and takes what it is now for all that follows. The error names the file: it is not there, refuses
  // this user, can't be read, has no sessions yet, or is of a newer version. To be called once.
  [[nodiscard]] Status open();

  const std::filesystem::path& file() const noexcept { return file_; }

  // By ascending id. Here and below the error names the file; nothing but open() comes before.
  Result<std::vector<SessionRow>> sessions(const SessionQuery& query = {});
  // Nothing without an error when there is no such session, or run.
  Result<std::optional<SessionRow>> session(std::int64_t id);
  Result<std::optional<RunRow>> run(std::int64_t id);
  // Of all sessions from the first to the last, both included, by session and id.
  Result<std::vector<PeriodRow>> periods(std::int64_t first, std::int64_t last);
  Result<std::vector<PeriodRow>> periods(std::int64_t session) { return periods(session, session); }
  // In the order in which they came; none in a file that keeps none.
  Result<std::vector<RepeatedRow>> repeated(std::int64_t session);
  // The newest event of a name that a session has between two ids, both included; it is looked for from the end.
  Result<std::optional<EventRow>> newest(std::int64_t session, const std::string& name, std::int64_t first,
                                         std::int64_t last);

 private:
  // Answers a question, with bounds of its own: binds, then hands over each row until `take` answers false.
  [[nodiscard]] Status answer(const std::string& sql, const std::function<void(Statement&)>& bind,
                              const std::function<bool(const Statement&)>& take);
  Error about(const Error& error) const { return {error.code, file_.string() + ": " + error.text}; }

  const std::filesystem::path file_;
  ReadBounds bounds_;
  // In a transaction from open() on.
  Connection connection_;
  // By their texts: a list of sessions asks the same thing of each.
  std::map<std::string, Statement> statements_;
};

}  // namespace tarn::recorder
