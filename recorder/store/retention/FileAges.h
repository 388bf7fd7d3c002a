// SPDX-License-Identifier: Apache-2.0
// FileAges: since when files that lie beside the recorder's are known, on the recorder's own time.
//
// Which problem: what a file says of its age is the wall clock's, and one step of that would make all of them old. How:
// the recorder notes when it first saw a file, in a table of its own database:
//
//   recorder_files(name TEXT PRIMARY KEY, seconds REAL)
//
// In a fresh database all files are new. Owner: the event writer. Threads: the writer's. What fails answers SQLite's
// code.
#pragma once

#include <map>
#include <set>
#include <string>

#include "recorder/store/rows/Connection.h"

namespace tarn::recorder {

class FileAges {
 public:
  // What the database knows, in place of what is known here.
  [[nodiscard]] int read(Connection& connection);
  // Writes what has changed since the last written(); in a transaction. Makes the table with the first file.
  [[nodiscard]] int write(Connection& connection) const;
  // That transaction is committed.
  void written() noexcept { changed_.clear(); }

  // When the file was first seen: now, where it wasn't before.
  double firstSeen(const std::string& name, double now);
  // Forgets the files that nobody has asked for since the last call.
  void forgetOthers();

 private:
  struct Seen {
    double seconds = 0;
    bool isThere = false;  // asked for since the last forgetOthers()
  };

  std::map<std::string, Seen> files_;
  std::set<std::string> changed_;  // new ones, and those that are forgotten
};

}  // namespace tarn::recorder
