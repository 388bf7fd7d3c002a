// SPDX-License-Identifier: Apache-2.0
// LinuxFileSystem: the machine's files, for the summary and trace files that the system itself writes. Errors are errno
// values with the system's text, without the path. Threads: any; the calls block on the disk.
#pragma once

#include <string>

#include "platform/FileSystem.h"

namespace tarn::linux_host {

class LinuxFileSystem final : public platform::FileSystem {
 public:
  // Where the well-known directories are, without a slash at the end. They are told as they are given here and made by
  // nobody in here.
  struct Directories {
    std::string diagnosticLogs;  // its last component is "DiagnosticLogs"
    std::string temporary;
  };

  explicit LinuxFileSystem(Directories directories);

  std::string wellKnownDirectory(platform::WellKnownDirectory which) const override;
  // As Files.h has it.
  Status createDirectories(std::string_view path, std::uint32_t permissions) override;
  // EEXIST when anything has the name, a dangling link too. Mode 0666 less the process's mask.
  Status createFile(std::string_view path) override;
  // ENOENT without a file, ELOOP for a symbolic link. Each write goes to the system at once; nothing is synced.
  Result<std::unique_ptr<platform::WritableFile>> openForWriting(std::string_view path) override;
  // EFBIG beyond `mostBytes`; without content beside any error. ENODEV for what is no regular file.
  Result<std::string> readFile(std::string_view path, std::size_t mostBytes) override;
  // Follows links: a dangling one isn't there.
  bool exists(std::string_view path) const override;
  // A rename; across file systems a copy beside the target, synced, that takes its place when it is whole and keeps the
  // file's permissions, after which the source is removed. When only that last step fails both are there, and the error
  // says so.
  Status moveFile(std::string_view from, std::string_view to) override;

 private:
  const Directories directories_;
};

}  // namespace tarn::linux_host
