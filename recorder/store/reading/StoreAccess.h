// SPDX-License-Identifier: Apache-2.0
// StoreAccess: how a tool comes to read the recorder's file, while it is being written or when no service runs.
//
// The file isn't trusted: whatever it holds, it stays as it is, nothing that its schema says is carried out beyond
// reading tables and views, and a read ends after work that its bytes are worth. Threads: those of the connection.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>

#include "plist/Result.h"
#include "recorder/store/rows/Connection.h"

namespace tarn::recorder {

// What a read may still cost. Rows of ours cost far less; a damaged or made-up file may lead into itself and would
// otherwise never end.
class ReadBounds {
 public:
  ReadBounds() = default;
  ReadBounds(const ReadBounds&) = delete;
  ReadBounds& operator=(const ReadBounds&) = delete;

  // For the read that begins: by the bytes of the file and its log, as they are now.
  void begin(const std::filesystem::path& file);
  // Has the connection's work counted from here on. This outlives the connection.
  void watch(Connection& connection);
  // Why the connection's last call failed, or that the read cost too much.
  Error lastError(const Connection& connection) const;

 private:
  std::int64_t stepsLeft_ = 0;  // of SQLite's machine, which asks for it every thousand steps
};

// Whether a file can be looked at.
enum class Presence {
  There,
  Missing,
  Refused,  // this user may not look at it, or not at its folder
};
Presence presenceOf(const std::filesystem::path& file);
// "PATH refuses this user: Permission denied"
Error refusalOf(const std::filesystem::path& file);

// Opens the file as a reader beside the writer; where its folder can't be written to and nobody else has it open, as it
// lies there (`asItLies`), without locks and log. It was read from once then, as only that shows whether it can be. The
// function matches_glob(pattern, text) is there for statements (globMatches). A failed connection is closed.
[[nodiscard]] Status openToRead(Connection& connection, const std::filesystem::path& file, ReadBounds& bounds,
                                bool& asItLies);

// That the file is of the version before there were sessions.
Error noSessionsIn(const std::filesystem::path& file);
// Whether the file has sessions that this program can read: nothing, or one line that names the file and its version.
[[nodiscard]] Status requireSessions(Connection& connection, const std::filesystem::path& file);

}  // namespace tarn::recorder
