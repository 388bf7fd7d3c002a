// LinuxFileSystem: the machine's files. Threads: any.
#pragma once

#include <string>

#include "platform/FileSystem.h"

namespace tarn::linux_host {

class LinuxFileSystem final : public platform::FileSystem {
 public:
  struct Directories {
    std::string diagnosticLogs;  // its last component is "DiagnosticLogs"
    std::string temporary;
  };

  explicit LinuxFileSystem(Directories directories);

  std::string wellKnownDirectory(platform::WellKnownDirectory which) const override;
  Status createDirectories(std::string_view path, std::uint32_t permissions) override;
  Status createFile(std::string_view path) override;
  Result<std::unique_ptr<platform::WritableFile>> openForWriting(std::string_view path) override;
  Result<std::string> readFile(std::string_view path, std::size_t mostBytes) override;
  bool exists(std::string_view path) const override;
  Status moveFile(std::string_view from, std::string_view to) override;

 private:
  const Directories directories_;
};

}  // namespace tarn::linux_host
