// SPDX-License-Identifier: Apache-2.0
// FaultyFiles: files for SQLite whose n-th call of a kind fails once, or so many times, as a disk or a short memory
// would make it fail, or is held up. While one lives it stands between SQLite and the real files, for every connection
// that is opened.
//
//   FaultyFiles files;
//   files.fail(FaultyFiles::Call::Sync, 3, FaultyFiles::Fault::InputOutput);
//
// Threads: any.
#pragma once

#include <sqlite3.h>

#include <array>
#include <condition_variable>
#include <cstddef>
#include <mutex>
#include <string>

namespace tarn::recorder {

class FaultyFiles {
 public:
  // The last is a Sync too; it is for stall() alone.
  enum class Call { Open, Read, Write, Sync, Truncate, Size, ShmMap, ShmLock, SyncOfDatabase };
  enum class Fault {
    InputOutput,
    NoSpace,
    NoMemory,
    Short,  // half of a write is done; a read ends in the middle
  };
  static constexpr std::array kCalls{Call::Open,     Call::Read, Call::Write,  Call::Sync,
                                     Call::Truncate, Call::Size, Call::ShmMap, Call::ShmLock};
  static constexpr std::array kFaults{Fault::InputOutput, Fault::NoSpace, Fault::NoMemory, Fault::Short};
  static std::string nameOf(Call call);

  FaultyFiles();
  ~FaultyFiles();
  FaultyFiles(const FaultyFiles&) = delete;
  FaultyFiles& operator=(const FaultyFiles&) = delete;

  // Controls. From now on the `ordinal`-th call of this kind fails, counted from 1, and those right after it.
  void fail(Call call, int ordinal, Fault fault, int times = 1);
  void heal();
  // From now on the next call of this kind doesn't come back until it is let go.
  void stall(Call call);
  void letGo();

  // Observations: whether any call has failed since fail().
  bool hasFailed() const;
  // Whether a call is held up now.
  bool isStalled() const;

  // For the files themselves: what this call is to do.
  struct Verdict {
    bool fails = false;
    Fault fault = Fault::InputOutput;
  };
  Verdict judge(Call call);
  sqlite3_vfs* real() const noexcept { return real_; }

 private:
  mutable std::mutex mutex_;
  bool armed_ = false;
  Call call_ = Call::Open;
  Fault fault_ = Fault::InputOutput;
  int until_ = 0;  // calls that still pass
  int times_ = 0;
  bool failed_ = false;
  bool stalls_ = false;
  Call stalling_ = Call::Open;
  bool stalled_ = false;
  std::condition_variable goesOn_;
  sqlite3_vfs* real_;
  sqlite3_vfs own_;
};

}  // namespace tarn::recorder
