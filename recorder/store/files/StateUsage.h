// SPDX-License-Identifier: Apache-2.0
// StateUsage: what the files beside the recorder's database take of the cap that holds for all of them.
//
//   cap = database + its log + index and counts + files set aside + the folders that others write
//         + messages of sessions that wait on disk
//
// Each kind but the database has a share. Beyond it files set aside go, the last one first: the first tells how the
// trouble began. Of a folder's files the oldest go. What is left of the cap is the database's. Nothing but regular
// files is looked at or removed, and no link is followed. Owner: the event writer. Threads: the writer's.
#pragma once

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

namespace tarn::recorder {

class StateUsage {
 public:
  // `others`: bytes that somebody else keeps within a share of a fourth; null: none.
  using Others = std::shared_ptr<const std::atomic<std::int64_t>>;
  StateUsage(std::filesystem::path file, std::vector<std::filesystem::path> folders, std::int64_t cap,
             Others others = nullptr)
      : file_(std::move(file)), folders_(std::move(folders)), cap_(cap), others_(std::move(others)) {}

  // Looks at all of it and removes what is beyond the shares (a fourth of the cap for files set aside, an eighth for
  // each folder); the names of what was removed. A file that can't be removed is passed over, and counts.
  std::vector<std::string> tidy();
  // Another cap from the next tidy() on.
  void setCap(std::int64_t cap) noexcept { cap_ = cap; }
  // What the database may take beside a log of this size, as of the last tidy(); a fourth of the cap at the least.
  std::int64_t databaseBytes(std::int64_t logBytes) const noexcept;

 private:
  const std::filesystem::path file_;
  const std::vector<std::filesystem::path> folders_;
  // Bytes, of everything together.
  std::int64_t cap_;
  const Others others_;
  std::int64_t beside_ = 0;  // of all but the database and its log
};

// Which other processes keep the log's index of this database locked for reading: "1234 (name)" each. Reads
// /proc/locks, so it is for a line that is rare; processes of other namespaces aren't seen.
std::vector<std::string> readersOf(const std::filesystem::path& database);

}  // namespace tarn::recorder
