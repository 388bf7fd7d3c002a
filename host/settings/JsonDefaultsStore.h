// SPDX-License-Identifier: Apache-2.0
// JsonDefaultsStore: the defaults store as one JSON file a suite or application domain, defaults/SUITE.json.
//
//   - A read sees what any process has written: the file is looked at each time and read again when it has changed.
//   - A write replaces the file whole, on disk before it returns, and reads it first under a lock that all writers
//     take, so that writers of different keys lose nothing. A writer waits for the lock, but not longer than it is
//     told to.
//   - A file that can't be read or is no JSON object reads as empty and is logged with its line and column, once for
//     each state of the file. It is never replaced: a write to it fails until somebody mends or removes it, because
//     it may hold more than the one key that is written.
//   - A suite's name is a plain file name. One of any other form holds nothing and takes nothing.
//
// Bounds: a file is at most 1 MiB; the content of at most 64 suites is kept in memory.
// Owned by the platform; the tool makes one of its own. Threads: any. A read that finds nothing changed costs one stat;
// a write waits for the disk.
#pragma once

#include <sys/stat.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>

#include "platform/DefaultsStore.h"
#include "platform/Log.h"
#include "plist/Dictionary.h"
#include "plist/Result.h"
#include "plist/ThreadSafety.h"

namespace tarn::linux_host {

class JsonDefaultsStore final : public platform::DefaultsStore {
 public:
  // A file is read and written whole, so this also bounds what one write costs. Settings take a few hundred bytes.
  static constexpr std::size_t kMaximumFileBytes = std::size_t{1} << 20U;

  // `folder` holds the suites' files; it is made with the first write. `lockPatience` is how long a write waits for
  // those of other processes. The log must outlive the store.
  JsonDefaultsStore(std::string folder, platform::Log& log,
                    std::chrono::milliseconds lockPatience = std::chrono::seconds(5));
  JsonDefaultsStore(const JsonDefaultsStore&) = delete;
  JsonDefaultsStore& operator=(const JsonDefaultsStore&) = delete;

  // A null in the file counts as no value, as do a key and a suite that aren't there.
  plist::Value value(std::string_view suite, std::string_view key) const override;
  // The preferences of the user "mobile" are the suite of the application domain's name. No other user has any.
  plist::Value preference(std::string_view key, std::string_view applicationDomain,
                          std::string_view user) const override;
  // As store() does, told as the facility tells it: a failure is logged with its reason and is false.
  [[nodiscard]] bool setValue(std::string_view suite, std::string_view key, const plist::ValueView& value) override;

  // The values of a whole suite, none when there is no such. An error tells what is wrong with its file:
  // "FILE:LINE:COLUMN: text" or "FILE: text".
  using Suite = Result<plist::Dictionary>;
  // The same from the cache while the file is as it was read; dictionaries are shared, so no value is copied.
  Suite suite(std::string_view name) const;
  // Stores a value, an absent one removes the key; it is on disk when that succeeds, and a key that isn't there is
  // removed without a write. Fails for a name that can't be a file's (EINVAL), when another writer keeps the lock
  // (ETIMEDOUT), for a file that is broken, would grow past the bound (EFBIG) or can't be written, and for a value
  // without a JSON form; then the file is as it was. Nothing is logged.
  [[nodiscard]] Status store(std::string_view suite, std::string_view key, const plist::ValueView& value);

 private:
  // Which state of the file was read: another file, size or time is another state. The time of change counts beside
  // that of the content, as a tool may set the latter back. Without a file the error tells states apart.
  struct Stamp {
    bool exists = false;
    int error = 0;
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    std::int64_t size = 0;
    std::int64_t modifiedNanoseconds = 0;
    std::int64_t changedNanoseconds = 0;
    friend bool operator==(const Stamp&, const Stamp&) = default;
  };
  // What was read of one suite, good or not.
  struct Cached {
    Stamp stamp;
    bool settled = false;  // a later change is sure to bring another stamp
    Suite suite;
    Stamp loggedStamp;  // of the broken file that was logged last
    Status logged;
  };

  // Only of a plain name.
  std::string pathOf(std::string_view suite) const;
  // `result` is that of the stat call that filled `facts`.
  static Stamp stampOf(int result, const struct stat& facts);
  // File times move in steps of some milliseconds: a file that was changed just now may change again under the same
  // stamp, so until it has rested for 100 ms each look reads it.
  static bool isSettled(const Stamp& stamp);
  // Stamp and content are of one open file, so a replacement in between doesn't mix them.
  static Suite read(const std::string& path, Stamp& stamp);
  // When the error or the state of the broken file is another than the last one logged.
  void logFault(Cached& cached) const;

  const std::string folder_;
  platform::Log& log_;
  const std::chrono::milliseconds lockPatience_;
  // For the cache. Held while a changed file is read, but not by writers, who go to the disk and leave the cache to the
  // next read.
  mutable Mutex mutex_;
  mutable std::map<std::string, Cached, std::less<>> cache_ TARN_GUARDED_BY(mutex_);
};

}  // namespace tarn::linux_host
