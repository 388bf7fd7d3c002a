// SPDX-License-Identifier: Apache-2.0
// StateUsage: what the files beside the recorder's database take of the cap that holds for all of them.
//
//   cap = database + its log + index and counts + files set aside + the files that others write
//         + messages of sessions that wait on disk
//
// Each kind but the database has a share and an age. Beyond its share files set aside go, the last one first: the first
// tells how the trouble began. Of the other kinds the oldest go. What is left of the cap is the database's. Nothing but
// regular files is looked at or removed, and no link is followed. Owner: the event writer. Threads: the writer's.
#pragma once

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "recorder/store/files/FileKinds.h"

namespace tarn::recorder {

class StateUsage {
 public:
  // `others`: bytes that somebody else keeps within a share of a fourth; null: none.
  using Others = std::shared_ptr<const std::atomic<std::int64_t>>;
  struct Removed {
    std::string name;
    std::string kind;
    bool isOld = false;  // else its kind was over its share
  };

  // `kinds`: those beside the files set aside, which have a fourth of the cap and so many days.
  StateUsage(std::filesystem::path file, double asideMaxAgeDays, std::vector<FileKind> kinds, std::int64_t cap,
             Others others = nullptr)
      : file_(std::move(file)),
        aside_{"file set aside", file_.parent_path(), "", false, 8, asideMaxAgeDays},
        kinds_(std::move(kinds)),
        cap_(cap),
        others_(std::move(others)) {}

  // How many seconds ago a file was seen first, by its path.
  using AgeOf = std::function<double(const std::string& path)>;

  // Looks at all of it and removes what is too old or beyond its kind's share; what was removed. A file that can't be
  // removed is passed over, and counts.
  std::vector<Removed> tidy(const AgeOf& ageOf);
  // Another cap from the next tidy() on.
  void setCap(std::int64_t cap) noexcept { cap_ = cap; }
  // What the database may take beside a log of this size, as of the last tidy(); a fourth of the cap at the least.
  std::int64_t databaseBytes(std::int64_t logBytes) const noexcept;

 private:
  const std::filesystem::path file_;
  const FileKind aside_;
  const std::vector<FileKind> kinds_;
  // Bytes, of everything together.
  std::int64_t cap_;
  const Others others_;
  std::int64_t beside_ = 0;  // of all but the database and its log
};

// Which other processes keep the log's index of this database locked for reading: "1234 (name)" each. Reads
// /proc/locks, so it is for a line that is rare; processes of other namespaces aren't seen.
std::vector<std::string> readersOf(const std::filesystem::path& database);

}  // namespace tarn::recorder
