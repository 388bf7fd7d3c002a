#include "host/machine/LinuxFileSystem.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <utility>

#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

using platform::MaybeError;
using platform::Outcome;

namespace {

constexpr std::size_t kBlockBytes = std::size_t{64} * 1024;
constexpr mode_t kFilePermissions = 0666;  // less the process's mask

MaybeError writeAll(int descriptor, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t written = ::write(descriptor, bytes.data(), bytes.size());
    if (written < 0) {
      if (errno == EINTR) continue;
      return lastSystemError();
    }
    bytes.remove_prefix(static_cast<std::size_t>(written));
  }
  return {};
}

// Holds nothing back: a disk that is full says so to the write that it refuses.
class OpenFile final : public platform::WritableFile {
 public:
  explicit OpenFile(int descriptor) : descriptor_(descriptor) {}
  ~OpenFile() override { static_cast<void>(close()); }
  OpenFile(const OpenFile&) = delete;
  OpenFile& operator=(const OpenFile&) = delete;

  MaybeError write(std::string_view bytes) override {
    return descriptor_ < 0 ? systemError(EBADF) : writeAll(descriptor_, bytes);
  }

  MaybeError close() override {
    if (descriptor_ < 0) return systemError(EBADF);
    // A disk that is written to later reports its failure here.
    return ::close(std::exchange(descriptor_, -1)) == 0 ? MaybeError() : lastSystemError();
  }

 private:
  int descriptor_;  // -1 once closed
};

MaybeError createDirectory(const std::string& path, mode_t permissions) {
  if (::mkdir(path.c_str(), permissions) == 0) return {};
  const int failure = errno;
  struct stat status {};
  if (failure == EEXIST && ::stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode)) return {};
  return systemError(failure == EEXIST ? ENOTDIR : failure);
}

MaybeError copyContent(int from, int to) {
  std::string block(kBlockBytes, '\0');
  for (;;) {
    const ssize_t got = ::read(from, block.data(), block.size());
    if (got == 0) return {};
    if (got < 0) {
      if (errno == EINTR) continue;
      return lastSystemError();
    }
    if (auto error = writeAll(to, std::string_view(block).substr(0, static_cast<std::size_t>(got)))) return error;
  }
}

// For another file system, where a file can't just be renamed: a copy beside the target takes its place when whole.
MaybeError moveByCopy(const std::string& from, const std::string& to) {
  const UniqueDescriptor source(::open(from.c_str(), O_RDONLY | O_CLOEXEC));
  if (!source) return lastSystemError();
  std::string beside = to + ".XXXXXX";
  const UniqueDescriptor copy(::mkostemp(beside.data(), O_CLOEXEC));
  if (!copy) return lastSystemError();
  struct stat status {};
  auto error = copyContent(source.get(), copy.get());
  if (!error && (::fstat(source.get(), &status) != 0 || ::fchmod(copy.get(), status.st_mode & 0777U) != 0 ||
                 ::fsync(copy.get()) != 0 || ::rename(beside.c_str(), to.c_str()) != 0)) {
    error = lastSystemError();
  }
  if (error) {
    ::unlink(beside.c_str());
    return error;
  }
  return ::unlink(from.c_str()) == 0 ? MaybeError() : lastSystemError();
}

}  // namespace

LinuxFileSystem::LinuxFileSystem(Directories directories) : directories_(std::move(directories)) {}

std::string LinuxFileSystem::wellKnownDirectory(platform::WellKnownDirectory which) const {
  return which == platform::WellKnownDirectory::DiagnosticLogs ? directories_.diagnosticLogs : directories_.temporary;
}

MaybeError LinuxFileSystem::createDirectories(std::string_view path, std::uint32_t permissions) {
  std::size_t end = 0;
  while (end < path.size()) {
    end = std::min(path.find('/', end + 1), path.size());
    if (auto error = createDirectory(std::string(path.substr(0, end)), static_cast<mode_t>(permissions))) return error;
  }
  return path.empty() ? systemError(ENOENT) : MaybeError();
}

MaybeError LinuxFileSystem::createFile(std::string_view path) {
  const UniqueDescriptor file(
      ::open(std::string(path).c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kFilePermissions));
  return file ? MaybeError() : lastSystemError();
}

Outcome<std::unique_ptr<platform::WritableFile>> LinuxFileSystem::openForWriting(std::string_view path) {
  const int file = ::open(std::string(path).c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
  if (file < 0) return {nullptr, lastSystemError()};
  return {std::make_unique<OpenFile>(file), {}};
}

Outcome<std::string> LinuxFileSystem::readFile(std::string_view path, std::size_t mostBytes) {
  // Not blocking, for the case that somebody put a pipe there.
  const UniqueDescriptor file(::open(std::string(path).c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  if (!file) return {{}, lastSystemError()};
  std::string content;
  std::string block(kBlockBytes, '\0');
  for (;;) {
    const ssize_t got = ::read(file.get(), block.data(), block.size());
    if (got == 0) return {std::move(content), {}};
    if (got < 0) {
      if (errno == EINTR) continue;
      return {{}, lastSystemError()};
    }
    content.append(block, 0, static_cast<std::size_t>(got));
    if (content.size() > mostBytes) return {{}, systemError(EFBIG)};
  }
}

bool LinuxFileSystem::exists(std::string_view path) const {
  return ::access(std::string(path).c_str(), F_OK) == 0;
}

MaybeError LinuxFileSystem::moveFile(std::string_view from, std::string_view to) {
  const std::string source(from);
  const std::string target(to);
  if (::rename(source.c_str(), target.c_str()) == 0) return {};
  return errno == EXDEV ? moveByCopy(source, target) : lastSystemError();
}

}  // namespace tarn::linux_host
