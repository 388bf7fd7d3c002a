// SPDX-License-Identifier: Apache-2.0
// FileReplacement: a file that is written beside its place and takes it when it is whole and on the disk, so that
// whoever reads sees what was there or all of the new. One that doesn't get there leaves nothing.
//
// Life: begin(), any number of write(), takePlace(); ending it earlier discards the file. Each write goes to the disk's
// cache at once, so a caller with many small pieces collects them first. All but begin() may block on the disk.
//
// Threads: one at a time. Nothing is thrown.
#pragma once

#include <string>
#include <string_view>

#include "host/system/UniqueDescriptor.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class FileReplacement {
 public:
  FileReplacement() = default;
  ~FileReplacement() { discard(); }
  FileReplacement(const FileReplacement&) = delete;
  FileReplacement& operator=(const FileReplacement&) = delete;

  // Takes over a file that was just made under the name `beside`, in the folder of its place: a rename is atomic only
  // within one file system. From here on this object closes and, if need be, removes it. To be called once.
  void begin(UniqueDescriptor file, std::string beside) noexcept;

  // From begin() to takePlace().
  bool isOpen() const noexcept { return static_cast<bool>(file_); }
  // For what is done to the file itself (owner, mode, size); -1 when none is open. It stays this object's.
  int descriptor() const noexcept { return file_.get(); }

  // Appends the bytes where the file's offset stands. After the first failure nothing more is written: after a gap it
  // would be worth nothing.
  void write(std::string_view bytes);
  // The first one, of a write or of the last step; good while there was none. It is kept, so a caller may write
  // everything and ask once.
  const Status& failure() const noexcept { return failure_; }

  // Brings it to the disk (fsync), closes it and renames it to `path`, replacing what stands there. The result is
  // failure(): of the first write, the sync or the rename; then nothing of the file is left and what stood at `path` is
  // untouched. The folder itself isn't synced: after a power cut the old name may be there, whole.
  [[nodiscard]] Status takePlace(const std::string& path);

 private:
  // Removes the file that never took its place; nothing when it did.
  void discard() noexcept;

  UniqueDescriptor file_;
  std::string beside_;  // empty while there is no file of that name
  // The first one; nothing is written, synced or renamed after it.
  Status failure_;
};

// Replaces the file at `path` whole, by way of `temporary` in the same folder. A file that was there hands down its
// mode and, from root's hands, its owner; a new one has mode 0640 and, from root's hands, the owner of its folder. The
// new name is on the disk too when this returns. On an error `path` is as it was, but for one of the last sync, when
// the new content is in place and only its name may not outlive a power cut. Two at a time with one `temporary` would
// write into one file: callers hold a FileLock.
[[nodiscard]] Status replaceFile(const std::string& path, const std::string& temporary, std::string_view content);

}  // namespace tarn::linux_host
