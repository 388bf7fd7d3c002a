// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeFileSystem.h"

#include <algorithm>
#include <mutex>
#include <utility>

namespace tarn::testing {

namespace {

// The numbers and texts that Linux has for these.
Error noSuchFile() {
  return {2, "No such file or directory"};
}
Error badDescriptor() {
  return {9, "Bad file descriptor"};
}
Error fileExists() {
  return {17, "File exists"};
}
Error notADirectory() {
  return {20, "Not a directory"};
}
Error fileTooLarge() {
  return {27, "File too large"};
}
Error noSpace() {
  return {28, "No space left on device"};
}

std::string parentOf(std::string_view path) {
  const auto slash = path.rfind('/');
  return slash == std::string_view::npos || slash == 0 ? "/" : std::string(path.substr(0, slash));
}

}  // namespace

struct FakeFileSystem::Disk {
  struct Order {
    Error error;
    std::size_t skip = 0;
  };

  Status ordered(Operation operation) {
    const auto found = orders.find(operation);
    if (found == orders.end()) return {};
    if (found->second.skip > 0) {
      --found->second.skip;
      return {};
    }
    return orders.extract(found).mapped().error;
  }

  Status makeDirectories(const std::string& path, std::uint32_t permissions) {
    if (directories.contains(path)) return {};
    if (files.contains(path)) return notADirectory();
    if (auto error = makeDirectories(parentOf(path), permissions); error.failed()) return error;
    directories.emplace(path, permissions);
    return {};
  }

  std::mutex mutex;
  std::map<std::string, std::shared_ptr<std::string>, std::less<>> files;
  std::map<std::string, std::uint32_t, std::less<>> directories{{"/", 0755}};
  std::map<Operation, Order> orders;
  std::optional<std::size_t> freeBytes;
  std::size_t openFiles = 0;
};

class FakeFileSystem::OpenFile final : public platform::WritableFile {
 public:
  OpenFile(std::shared_ptr<Disk> disk, std::shared_ptr<std::string> content)
      : disk_(std::move(disk)), content_(std::move(content)) {
    ++disk_->openFiles;
  }
  ~OpenFile() override {
    if (content_ != nullptr) {
      const std::lock_guard lock(disk_->mutex);
      --disk_->openFiles;
    }
  }
  OpenFile(const OpenFile&) = delete;
  OpenFile& operator=(const OpenFile&) = delete;

  Status write(std::string_view bytes) override {
    const std::lock_guard lock(disk_->mutex);
    if (content_ == nullptr) return badDescriptor();
    if (auto error = disk_->ordered(Operation::Write); error.failed()) return error;
    const auto fitting = std::min(bytes.size(), disk_->freeBytes.value_or(bytes.size()));
    content_->append(bytes.substr(0, fitting));
    if (disk_->freeBytes) {
      *disk_->freeBytes -= fitting;
    }
    return fitting == bytes.size() ? Status() : noSpace();
  }

  Status close() override {
    const std::lock_guard lock(disk_->mutex);
    if (content_ == nullptr) return badDescriptor();
    content_.reset();
    --disk_->openFiles;
    return disk_->ordered(Operation::Close);
  }

 private:
  const std::shared_ptr<Disk> disk_;
  std::shared_ptr<std::string> content_;  // null once closed
};

FakeFileSystem::FakeFileSystem() : disk_(std::make_shared<Disk>()) {}
FakeFileSystem::~FakeFileSystem() = default;

std::string FakeFileSystem::wellKnownDirectory(platform::WellKnownDirectory which) const {
  return which == platform::WellKnownDirectory::DiagnosticLogs ? "/device/DiagnosticLogs" : "/device/tmp";
}

Status FakeFileSystem::createDirectories(std::string_view path, std::uint32_t permissions) {
  const std::lock_guard lock(disk_->mutex);
  if (auto error = disk_->ordered(Operation::CreateDirectories); error.failed()) return error;
  return disk_->makeDirectories(std::string(path), permissions);
}

Status FakeFileSystem::createFile(std::string_view path) {
  const std::lock_guard lock(disk_->mutex);
  if (auto error = disk_->ordered(Operation::CreateFile); error.failed()) return error;
  if (!disk_->directories.contains(parentOf(path))) return noSuchFile();
  if (disk_->files.contains(path) || disk_->directories.contains(path)) return fileExists();
  disk_->files.emplace(path, std::make_shared<std::string>());
  return {};
}

Result<std::unique_ptr<platform::WritableFile>> FakeFileSystem::openForWriting(std::string_view path) {
  const std::lock_guard lock(disk_->mutex);
  if (auto error = disk_->ordered(Operation::OpenForWriting); error.failed()) return {nullptr, std::move(error)};
  const auto found = disk_->files.find(path);
  if (found == disk_->files.end()) return {nullptr, noSuchFile()};
  found->second->clear();
  return {std::make_unique<OpenFile>(disk_, found->second), {}};
}

Result<std::string> FakeFileSystem::readFile(std::string_view path, std::size_t mostBytes) {
  const std::lock_guard lock(disk_->mutex);
  if (auto error = disk_->ordered(Operation::ReadFile); error.failed()) return {{}, std::move(error)};
  const auto found = disk_->files.find(path);
  if (found == disk_->files.end()) return {{}, noSuchFile()};
  if (found->second->size() > mostBytes) return {{}, fileTooLarge()};
  return {*found->second, {}};
}

bool FakeFileSystem::exists(std::string_view path) const {
  const std::lock_guard lock(disk_->mutex);
  return disk_->files.contains(path) || disk_->directories.contains(path);
}

Status FakeFileSystem::moveFile(std::string_view from, std::string_view to) {
  const std::lock_guard lock(disk_->mutex);
  if (auto error = disk_->ordered(Operation::MoveFile); error.failed()) return error;
  const auto found = disk_->files.find(from);
  if (found == disk_->files.end() || !disk_->directories.contains(parentOf(to))) return noSuchFile();
  auto content = std::move(found->second);
  disk_->files.erase(found);
  disk_->files.insert_or_assign(std::string(to), std::move(content));
  return {};
}

void FakeFileSystem::failNext(Operation operation, Error error, std::size_t skip) {
  const std::lock_guard lock(disk_->mutex);
  disk_->orders.insert_or_assign(operation, Disk::Order{std::move(error), skip});
}

void FakeFileSystem::setFreeBytes(std::optional<std::size_t> bytes) {
  const std::lock_guard lock(disk_->mutex);
  disk_->freeBytes = bytes;
}

void FakeFileSystem::putFile(std::string_view path, std::string_view content) {
  const std::lock_guard lock(disk_->mutex);
  if (disk_->makeDirectories(parentOf(path), 0755).failed()) return;
  disk_->files.insert_or_assign(std::string(path), std::make_shared<std::string>(content));
}

std::optional<std::string> FakeFileSystem::content(std::string_view path) const {
  const std::lock_guard lock(disk_->mutex);
  const auto found = disk_->files.find(path);
  return found == disk_->files.end() ? std::nullopt : std::optional(*found->second);
}

std::vector<std::string> FakeFileSystem::files() const {
  const std::lock_guard lock(disk_->mutex);
  std::vector<std::string> paths;
  for (const auto& [path, content] : disk_->files) {
    paths.push_back(path);
  }
  return paths;
}

std::optional<std::uint32_t> FakeFileSystem::directoryPermissions(std::string_view path) const {
  const std::lock_guard lock(disk_->mutex);
  const auto found = disk_->directories.find(path);
  return found == disk_->directories.end() ? std::nullopt : std::optional(found->second);
}

std::size_t FakeFileSystem::openFiles() const {
  const std::lock_guard lock(disk_->mutex);
  return disk_->openFiles;
}

}  // namespace tarn::testing
