// FileReplacement: a file that is written beside its place and takes it when it is whole and on the disk, so that
// whoever reads sees what was there or all of the new. One that doesn't get there leaves nothing.
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

  // Takes over a file that was just made under the name `beside`, in the folder of its place. To be called once.
  void begin(UniqueDescriptor file, std::string beside) noexcept;

  bool isOpen() const noexcept { return static_cast<bool>(file_); }
  int descriptor() const noexcept { return file_.get(); }

  // After the first failure nothing more is written: after a gap it would be worth nothing.
  void write(std::string_view bytes);
  // The first one.
  const Status& failure() const noexcept { return failure_; }

  // Brings it to the disk and under its name, and closes it. Nothing of it is left when that or a write failed.
  [[nodiscard]] Status takePlace(const std::string& path);

 private:
  void discard() noexcept;

  UniqueDescriptor file_;
  std::string beside_;  // empty while there is no file of that name
  Status failure_;
};

// Replaces a file whole, by way of `temporary` in the same folder. A file that was there hands down its mode and, from
// root's hands, its owner. The new name is on the disk too when this returns.
[[nodiscard]] Status replaceFile(const std::string& path, const std::string& temporary, std::string_view content);

}  // namespace tarn::linux_host
