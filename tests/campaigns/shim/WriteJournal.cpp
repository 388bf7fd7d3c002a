// SPDX-License-Identifier: Apache-2.0
// WriteJournal: writes down, in their order, what a program does to the files below one folder: made, written, cut,
// synchronised, removed, renamed. From that a campaign builds what a power cut at any moment could have left.
//
// TARN_SHIM_ROOT is the folder, TARN_SHIM_JOURNAL the file that grows. Each entry is a header and then the path below
// the folder and the bytes; tests/campaigns/powercut.py reads it. An entry stands there before the call returns, and
// the control page counts them, so who sees an effect of a call finds its entry counted. Mapped pages go unseen.
#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cstdarg>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>

#include "tests/campaigns/shim/Control.h"

namespace tarn::campaigns {

namespace {

enum class Deed : std::uint32_t { Made = 1, Written, Cut, Synchronised, Removed, Renamed };

struct Header {
  Deed deed;
  std::uint32_t pathBytes;
  std::uint64_t at;
  std::uint64_t dataBytes;
};

class Journal {
 public:
  Journal() {
    const char* const root = std::getenv("TARN_SHIM_ROOT");
    const char* const journal = std::getenv("TARN_SHIM_JOURNAL");
    if (root != nullptr && journal != nullptr) {
      root_ = root;
      file_ = ::syscall(SYS_openat, AT_FDCWD, journal, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
    }
  }

  // One call at a time, so that the order of the entries is that of the effects.
  std::mutex& mutex() noexcept { return mutex_; }

  void opened(int file, const char* path, int flags) {
    const std::string below = belowRoot(path);
    if (file < 0 || below.empty() || static_cast<std::size_t>(file) >= paths_.size()) return;
    paths_[static_cast<std::size_t>(file)] = below;
    if ((flags & O_CREAT) != 0) {
      add(Deed::Made, below, 0, {});
    }
    if ((flags & O_TRUNC) != 0) {
      add(Deed::Cut, below, 0, {});
    }
  }
  void closed(int file) {
    if (isKnown(file)) {
      paths_[static_cast<std::size_t>(file)].clear();
    }
  }
  void did(Deed deed, int file, std::uint64_t at, std::string_view data) {
    if (isKnown(file)) {
      add(deed, paths_[static_cast<std::size_t>(file)], at, data);
    }
  }
  void didTo(Deed deed, const char* path, const char* other) {
    if (const std::string below = belowRoot(path); !below.empty()) {
      add(deed, below, 0, other == nullptr ? std::string() : belowRoot(other));
    }
  }

 private:
  bool isKnown(int file) const noexcept {
    return file >= 0 && static_cast<std::size_t>(file) < paths_.size() &&
           !paths_[static_cast<std::size_t>(file)].empty();
  }
  // The folder itself is ".".
  std::string belowRoot(const char* path) const {
    const std::string_view whole(path);
    if (file_ < 0 || !whole.starts_with(root_)) return {};
    const std::string_view rest = whole.substr(root_.size());
    return rest.empty() || rest == "/" ? "." : rest.front() == '/' ? std::string(rest.substr(1)) : std::string();
  }
  void add(Deed deed, std::string_view path, std::uint64_t at, std::string_view data) {
    const Header header{deed, static_cast<std::uint32_t>(path.size()), at, data.size()};
    std::string entry(reinterpret_cast<const char*>(&header), sizeof header);
    entry.append(path).append(data);
    ::syscall(SYS_write, file_, entry.data(), entry.size());
    if (Words* const words = controlWords()) {
      word(words, Word::Sequence).fetch_add(1);
    }
  }

  std::mutex mutex_;
  std::string root_;
  long file_ = -1;
  std::array<std::string, 4096> paths_;  // by descriptor; empty: none of ours
};

Journal& journal() {
  static Journal* const instance = std::make_unique<Journal>().release();  // other threads outlive main
  return *instance;
}

std::string_view bytes(const void* data, ssize_t size) noexcept {
  return {static_cast<const char*>(data), static_cast<std::size_t>(size)};
}

int openAndNote(const char* name, const char* path, int flags, mode_t mode) {
  const auto next = nextFunction<int(const char*, int, ...)>(name);
  const std::lock_guard lock(journal().mutex());
  const int file = next(path, flags, mode);
  journal().opened(file, path, flags);
  return file;
}

}  // namespace

// By other names in here, so that the library's own declarations needn't be met exactly.
extern "C" {

int tarnOpen(const char* path, int flags, ...) __asm__("open");
int tarnOpen(const char* path, int flags, ...) {
  std::va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  return openAndNote("open", path, flags, mode);
}

int tarnOpen64(const char* path, int flags, ...) __asm__("open64");
int tarnOpen64(const char* path, int flags, ...) {
  std::va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  return openAndNote("open64", path, flags, mode);
}

int tarnClose(int file) __asm__("close");
int tarnClose(int file) {
  static const auto next = nextFunction<int(int)>("close");
  const std::lock_guard lock(journal().mutex());
  journal().closed(file);
  return next(file);
}

ssize_t tarnWrite(int file, const void* data, std::size_t size) __asm__("write");
ssize_t tarnWrite(int file, const void* data, std::size_t size) {
  static const auto next = nextFunction<ssize_t(int, const void*, std::size_t)>("write");
  const std::lock_guard lock(journal().mutex());
  const ssize_t written = next(file, data, size);
  if (written > 0) {
    const off_t end = ::lseek(file, 0, SEEK_CUR);
    journal().did(Deed::Written, file, static_cast<std::uint64_t>(end - written), bytes(data, written));
  }
  return written;
}

ssize_t tarnPWrite64(int file, const void* data, std::size_t size, off64_t at) __asm__("pwrite64");
ssize_t tarnPWrite64(int file, const void* data, std::size_t size, off64_t at) {
  static const auto next = nextFunction<ssize_t(int, const void*, std::size_t, off64_t)>("pwrite64");
  const std::lock_guard lock(journal().mutex());
  const ssize_t written = next(file, data, size, at);
  if (written > 0) {
    journal().did(Deed::Written, file, static_cast<std::uint64_t>(at), bytes(data, written));
  }
  return written;
}

ssize_t tarnPWrite(int file, const void* data, std::size_t size, off_t at) __asm__("pwrite");
ssize_t tarnPWrite(int file, const void* data, std::size_t size, off_t at) {
  return tarnPWrite64(file, data, size, at);
}

int tarnTruncate64(int file, off64_t size) __asm__("ftruncate64");
int tarnTruncate64(int file, off64_t size) {
  static const auto next = nextFunction<int(int, off64_t)>("ftruncate64");
  const std::lock_guard lock(journal().mutex());
  const int result = next(file, size);
  if (result == 0) {
    journal().did(Deed::Cut, file, static_cast<std::uint64_t>(size), {});
  }
  return result;
}

int tarnTruncate(int file, off_t size) __asm__("ftruncate");
int tarnTruncate(int file, off_t size) {
  return tarnTruncate64(file, size);
}

int tarnDataSync(int file) __asm__("fdatasync");
int tarnDataSync(int file) {
  static const auto next = nextFunction<int(int)>("fdatasync");
  const std::lock_guard lock(journal().mutex());
  const int result = next(file);
  if (result == 0) {
    journal().did(Deed::Synchronised, file, 0, {});
  }
  return result;
}

int tarnSync(int file) __asm__("fsync");
int tarnSync(int file) {
  static const auto next = nextFunction<int(int)>("fsync");
  const std::lock_guard lock(journal().mutex());
  const int result = next(file);
  if (result == 0) {
    journal().did(Deed::Synchronised, file, 0, {});
  }
  return result;
}

int tarnUnlink(const char* path) __asm__("unlink");
int tarnUnlink(const char* path) {
  static const auto next = nextFunction<int(const char*)>("unlink");
  const std::lock_guard lock(journal().mutex());
  const int result = next(path);
  if (result == 0) {
    journal().didTo(Deed::Removed, path, nullptr);
  }
  return result;
}

int tarnRename(const char* from, const char* to) __asm__("rename");
int tarnRename(const char* from, const char* to) {
  static const auto next = nextFunction<int(const char*, const char*)>("rename");
  const std::lock_guard lock(journal().mutex());
  const int result = next(from, to);
  if (result == 0) {
    journal().didTo(Deed::Renamed, from, to);
  }
  return result;
}

}  // extern "C"

}  // namespace tarn::campaigns
