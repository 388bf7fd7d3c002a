// SPDX-License-Identifier: Apache-2.0
// FakeFileSystem: files in memory. A path needs its directory, as on a disk.
//
// Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/FileSystem.h"

namespace tarn::testing {

class FakeFileSystem final : public platform::FileSystem {
 public:
  enum class Operation { CreateDirectories, CreateFile, OpenForWriting, Write, Close, ReadFile, MoveFile };

  FakeFileSystem();
  ~FakeFileSystem() override;
  FakeFileSystem(const FakeFileSystem&) = delete;
  FakeFileSystem& operator=(const FakeFileSystem&) = delete;

  // The interface.
  std::string wellKnownDirectory(platform::WellKnownDirectory which) const override;
  Status createDirectories(std::string_view path, std::uint32_t permissions) override;
  Status createFile(std::string_view path) override;
  Result<std::unique_ptr<platform::WritableFile>> openForWriting(std::string_view path) override;
  Result<std::string> readFile(std::string_view path, std::size_t mostBytes) override;
  bool exists(std::string_view path) const override;
  Status moveFile(std::string_view from, std::string_view to) override;

  // Controls.
  // Lets the next call of the operation fail, or the `skip` + 1st from here. One such order for each operation.
  void failNext(Operation operation, Error error, std::size_t skip = 0);
  // The disk takes this many bytes more; a write beyond them keeps what fits and fails with error 28.
  void setFreeBytes(std::optional<std::size_t> bytes);
  // Puts a file there, with the directories above it.
  void putFile(std::string_view path, std::string_view content);

  // Observations.
  // The content of a file, also of one that is still open; nothing when there is none.
  std::optional<std::string> content(std::string_view path) const;
  std::vector<std::string> files() const;  // sorted
  // The permissions that a directory was made with; nothing when there is none.
  std::optional<std::uint32_t> directoryPermissions(std::string_view path) const;
  std::size_t openFiles() const;

 private:
  class OpenFile;
  struct Disk;

  // Shared with the open files, which may outlive this object.
  std::shared_ptr<Disk> disk_;
};

}  // namespace tarn::testing
