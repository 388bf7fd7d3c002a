// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxFileSystem.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <utility>

#include "host/system/FileReplacement.h"
#include "host/system/Files.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kBlockBytes = std::size_t{64} * 1024;
constexpr mode_t kFilePermissions = 0666;  // less the process's mask

// Holds nothing back: a disk that is full says so to the write that it refuses.
class OpenFile final : public platform::WritableFile {
 public:
  explicit OpenFile(UniqueDescriptor descriptor) : descriptor_(std::move(descriptor)) {}

  Status write(std::string_view bytes) override {
    return descriptor_ ? writeAll(descriptor_.get(), bytes) : systemError(EBADF);
  }

  Status close() override {
    if (!descriptor_) return systemError(EBADF);
    // A disk that is written to later reports its failure here.
    return ::close(descriptor_.release()) == 0 ? Status() : lastSystemError();
  }

 private:
  // Empty once closed. What is left open goes by itself, without an error's text, for which there may be no memory.
  UniqueDescriptor descriptor_;
};

Status copyContent(int from, FileReplacement& to) {
  std::string block(kBlockBytes, '\0');
  for (;;) {
    const ssize_t got = ::read(from, block.data(), block.size());
    if (got == 0) return {};
    if (got < 0) {
      if (errno == EINTR) continue;
      return lastSystemError();
    }
    to.write(std::string_view(block).substr(0, static_cast<std::size_t>(got)));
    if (to.failure().failed()) return to.failure();
  }
}

// For another file system, where a file can't just be renamed: a copy beside the target takes its place when whole.
Status moveByCopy(const std::string& from, const std::string& to) {
  const UniqueDescriptor source(::open(from.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
  if (!source) return lastSystemError();
  std::string beside = to + ".XXXXXX";
  UniqueDescriptor made(::mkostemp(beside.data(), O_CLOEXEC));
  if (!made) return lastSystemError();
  FileReplacement copy;
  copy.begin(std::move(made), std::move(beside));
  if (auto error = copyContent(source.get(), copy); error.failed()) return error;
  struct stat status {};
  if (::fstat(source.get(), &status) != 0 || ::fchmod(copy.descriptor(), status.st_mode & 0777U) != 0) {
    return lastSystemError();
  }
  if (auto error = copy.takePlace(to); error.failed()) return error;
  return ::unlink(from.c_str()) == 0 ? Status() : lastSystemError();
}

}  // namespace

LinuxFileSystem::LinuxFileSystem(Directories directories) : directories_(std::move(directories)) {}

std::string LinuxFileSystem::wellKnownDirectory(platform::WellKnownDirectory which) const {
  return which == platform::WellKnownDirectory::DiagnosticLogs ? directories_.diagnosticLogs : directories_.temporary;
}

Status LinuxFileSystem::createDirectories(std::string_view path, std::uint32_t permissions) {
  return linux_host::createDirectories(std::string(path), static_cast<mode_t>(permissions));
}

Status LinuxFileSystem::createFile(std::string_view path) {
  const UniqueDescriptor file(
      ::open(std::string(path).c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kFilePermissions));
  return file ? Status() : lastSystemError();
}

Result<std::unique_ptr<platform::WritableFile>> LinuxFileSystem::openForWriting(std::string_view path) {
  UniqueDescriptor file(::open(std::string(path).c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC | O_NOFOLLOW));
  if (!file) return {nullptr, lastSystemError()};
  return {std::make_unique<OpenFile>(std::move(file)), {}};
}

Result<std::string> LinuxFileSystem::readFile(std::string_view path, std::size_t mostBytes) {
  auto file = readSmallFile(std::string(path), mostBytes);
  if (file.failed()) {
    file.value.clear();
  }
  return file;
}

bool LinuxFileSystem::exists(std::string_view path) const {
  return ::access(std::string(path).c_str(), F_OK) == 0;
}

Status LinuxFileSystem::moveFile(std::string_view from, std::string_view to) {
  const std::string source(from);
  const std::string target(to);
  if (::rename(source.c_str(), target.c_str()) == 0) return {};
  return errno == EXDEV ? moveByCopy(source, target) : lastSystemError();
}

}  // namespace tarn::linux_host
