// SPDX-License-Identifier: Apache-2.0
// StoreFiles: the database and its two companions, the write-ahead log and the log's index, as the file system shows
// them: whether they can be ours, whether they are still those that were opened, and their new names when they are set
// aside.
//
// Owner: the EventFile. Threads: the writer's. What fails answers SQLite's code.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "plist/Result.h"

namespace tarn::recorder {

class StoreFiles {
 public:
  enum class LogState { Whole, Gone, Cut };

  StoreFiles(std::filesystem::path path, const platform::Clock& clock);

  const std::filesystem::path& path() const noexcept { return path_; }

  // Puts out of the way what can't be opened, and makes the folders where they are missing.
  [[nodiscard]] Status prepare();
  // What was put out of the way, by its new name.
  std::vector<std::string> takePutAside() noexcept { return std::exchange(putAside_, {}); }
  // Before the database is opened: what is known of its companions is that of another one.
  void forgetCompanions() noexcept;
  // After it: this is the file from now on.
  [[nodiscard]] Status noteOpened();
  // Whether the file in its place is still the opened one.
  [[nodiscard]] Status checkIsOpened() const;
  // Whether the opened file was read through and found good.
  bool isKnownGood() const noexcept { return good_ == opened_; }
  void noteGood() noexcept { good_ = opened_; }
  void forgetGood() noexcept { good_ = {}; }

  // Of the log in which so many bytes were committed.
  [[nodiscard]] Result<LogState> lookAtLog(std::int64_t bytes);
  // Before a transaction, and in it. Where the log's index is cut, SQLite would take old pages for the newest.
  void noteIndex() { indexBytes_ = indexBytes(); }
  [[nodiscard]] Status checkIndex() const;

  // Gives the closed file and what belongs to it another name, which is the value.
  [[nodiscard]] Result<std::filesystem::path> setAside() const;

 private:
  struct Identity {
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    friend bool operator==(const Identity&, const Identity&) = default;
  };

  [[nodiscard]] Result<Identity> readIdentity() const;
  [[nodiscard]] Status putOddCompanionsAside();
  std::int64_t indexBytes() const noexcept;
  std::filesystem::path freeName(const std::string& suffix) const;

  const std::filesystem::path path_;
  // The companions' names are made once, as every transaction asks for them and no memory may be missing then.
  const std::filesystem::path log_;
  const std::filesystem::path index_;
  const platform::Clock& clock_;
  Identity opened_;
  Identity good_;
  std::vector<std::string> putAside_;
  std::uint64_t tornBefore_ = 0;  // mappings torn before the file was opened
  std::int64_t indexBytes_ = 0;   // of the log's index when the transaction began
  std::uint64_t logInode_ = 0;    // of the write-ahead log after the last commit
};

}  // namespace tarn::recorder
