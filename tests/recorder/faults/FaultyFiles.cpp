// SPDX-License-Identifier: Apache-2.0
#include "tests/recorder/faults/FaultyFiles.h"

#include <cstring>
#include <new>

namespace tarn::recorder {

namespace {

using Call = FaultyFiles::Call;
using Fault = FaultyFiles::Fault;

// What SQLite allocates for a file: ours, then the real one.
struct File {
  sqlite3_file base;
  FaultyFiles* owner;
  bool isDatabase;
};

File& ours(sqlite3_file* file) {
  return *reinterpret_cast<File*>(file);
}

sqlite3_file* real(sqlite3_file* file) {
  return reinterpret_cast<sqlite3_file*>(reinterpret_cast<std::byte*>(file) + sizeof(File));
}

int codeOf(Call call, Fault fault) {
  if (fault == Fault::NoMemory) return call == Call::Open ? SQLITE_NOMEM : SQLITE_IOERR_NOMEM;
  switch (call) {
    case Call::Open:
      return SQLITE_CANTOPEN;
    case Call::Read:
      return SQLITE_IOERR_READ;
    case Call::Write:
      return fault == Fault::InputOutput ? SQLITE_IOERR_WRITE : SQLITE_FULL;
    case Call::Sync:
    case Call::SyncOfDatabase:
      return SQLITE_IOERR_FSYNC;
    case Call::Truncate:
      return SQLITE_IOERR_TRUNCATE;
    case Call::Size:
      return SQLITE_IOERR_FSTAT;
    case Call::ShmMap:
      return SQLITE_IOERR_SHMMAP;
    case Call::ShmLock:
      return SQLITE_IOERR_SHMLOCK;
  }
  return SQLITE_IOERR;
}

int readAt(sqlite3_file* file, void* bytes, int size, sqlite3_int64 at) {
  const auto verdict = ours(file).owner->judge(Call::Read);
  if (!verdict.fails) return real(file)->pMethods->xRead(real(file), bytes, size, at);
  if (verdict.fault != Fault::Short) return codeOf(Call::Read, verdict.fault);
  std::memset(bytes, 0, static_cast<std::size_t>(size));
  static_cast<void>(real(file)->pMethods->xRead(real(file), bytes, size / 2, at));
  return SQLITE_IOERR_SHORT_READ;
}

int writeAt(sqlite3_file* file, const void* bytes, int size, sqlite3_int64 at) {
  const auto verdict = ours(file).owner->judge(Call::Write);
  if (!verdict.fails) return real(file)->pMethods->xWrite(real(file), bytes, size, at);
  if (verdict.fault == Fault::Short) {
    static_cast<void>(real(file)->pMethods->xWrite(real(file), bytes, size / 2, at));
  }
  return codeOf(Call::Write, verdict.fault);
}

template <Call kCall, class... Args>
int judged(sqlite3_file* file, int (*method)(sqlite3_file*, Args...), Args... args) {
  const auto verdict = ours(file).owner->judge(kCall);
  return verdict.fails ? codeOf(kCall, verdict.fault) : method(real(file), args...);
}

int mapShared(sqlite3_file* file, int region, int size, int extend, void volatile** memory) {
  return judged<Call::ShmMap>(file, real(file)->pMethods->xShmMap, region, size, extend, memory);
}

int lockShared(sqlite3_file* file, int offset, int count, int flags) {
  // What gives a lock back can't fail.
  if ((flags & SQLITE_SHM_UNLOCK) != 0) return real(file)->pMethods->xShmLock(real(file), offset, count, flags);
  return judged<Call::ShmLock>(file, real(file)->pMethods->xShmLock, offset, count, flags);
}

constexpr sqlite3_io_methods kMethods{
    2,
    [](sqlite3_file* file) {
      return real(file)->pMethods == nullptr ? SQLITE_OK : real(file)->pMethods->xClose(real(file));
    },
    readAt,
    writeAt,
    [](sqlite3_file* file, sqlite3_int64 size) {
      return judged<Call::Truncate>(file, real(file)->pMethods->xTruncate, size);
    },
    [](sqlite3_file* file, int flags) {
      if (ours(file).isDatabase) {
        static_cast<void>(ours(file).owner->judge(Call::SyncOfDatabase));
      }
      return judged<Call::Sync>(file, real(file)->pMethods->xSync, flags);
    },
    [](sqlite3_file* file, sqlite3_int64* size) {
      return judged<Call::Size>(file, real(file)->pMethods->xFileSize, size);
    },
    [](sqlite3_file* file, int level) { return real(file)->pMethods->xLock(real(file), level); },
    [](sqlite3_file* file, int level) { return real(file)->pMethods->xUnlock(real(file), level); },
    [](sqlite3_file* file, int* held) { return real(file)->pMethods->xCheckReservedLock(real(file), held); },
    [](sqlite3_file* file, int control, void* argument) {
      return real(file)->pMethods->xFileControl(real(file), control, argument);
    },
    [](sqlite3_file* file) { return real(file)->pMethods->xSectorSize(real(file)); },
    [](sqlite3_file* file) { return real(file)->pMethods->xDeviceCharacteristics(real(file)); },
    mapShared,
    lockShared,
    [](sqlite3_file* file) { real(file)->pMethods->xShmBarrier(real(file)); },
    [](sqlite3_file* file, int remove) { return real(file)->pMethods->xShmUnmap(real(file), remove); },
    nullptr,
    nullptr,
};

FaultyFiles& ownerOf(sqlite3_vfs* files) {
  return *static_cast<FaultyFiles*>(files->pAppData);
}

int openFile(sqlite3_vfs* files, const char* name, sqlite3_file* file, int flags, int* flagsOut) {
  FaultyFiles& owner = ownerOf(files);
  ours(file).base.pMethods = nullptr;
  ours(file).owner = &owner;
  ours(file).isDatabase = (flags & SQLITE_OPEN_MAIN_DB) != 0;
  const auto verdict = owner.judge(Call::Open);
  if (verdict.fails) return codeOf(Call::Open, verdict.fault);
  const int code = owner.real()->xOpen(owner.real(), name, real(file), flags, flagsOut);
  if (real(file)->pMethods != nullptr) {
    ours(file).base.pMethods = &kMethods;
  }
  return code;
}

}  // namespace

std::string FaultyFiles::nameOf(Call call) {
  constexpr std::array kNames{"Open", "Read",   "Write",   "Sync",          "Truncate",
                              "Size", "ShmMap", "ShmLock", "SyncOfDatabase"};
  return kNames[static_cast<std::size_t>(call)];
}

FaultyFiles::FaultyFiles() : real_(nullptr), own_{} {
  sqlite3_initialize();
  real_ = sqlite3_vfs_find(nullptr);
  own_ = *real_;
  own_.zName = "faulty";
  own_.szOsFile = static_cast<int>(sizeof(File)) + real_->szOsFile;
  own_.pNext = nullptr;
  own_.pAppData = this;
  own_.xOpen = openFile;
  own_.xDelete = [](sqlite3_vfs* files, const char* name, int sync) {
    return ownerOf(files).real()->xDelete(ownerOf(files).real(), name, sync);
  };
  own_.xAccess = [](sqlite3_vfs* files, const char* name, int flags, int* result) {
    return ownerOf(files).real()->xAccess(ownerOf(files).real(), name, flags, result);
  };
  own_.xFullPathname = [](sqlite3_vfs* files, const char* name, int size, char* path) {
    return ownerOf(files).real()->xFullPathname(ownerOf(files).real(), name, size, path);
  };
  sqlite3_vfs_register(&own_, 1);
}

FaultyFiles::~FaultyFiles() {
  sqlite3_vfs_unregister(&own_);
  sqlite3_vfs_register(real_, 1);
}

void FaultyFiles::fail(Call call, int ordinal, Fault fault, int times) {
  const std::lock_guard lock(mutex_);
  armed_ = true;
  call_ = call;
  fault_ = fault;
  until_ = ordinal - 1;
  times_ = times;
  failed_ = false;
}

void FaultyFiles::heal() {
  const std::lock_guard lock(mutex_);
  armed_ = false;
}

bool FaultyFiles::hasFailed() const {
  const std::lock_guard lock(mutex_);
  return failed_;
}

void FaultyFiles::stall(Call call) {
  const std::lock_guard lock(mutex_);
  stalls_ = true;
  stalling_ = call;
}

void FaultyFiles::letGo() {
  const std::lock_guard lock(mutex_);
  stalls_ = false;
  goesOn_.notify_all();
}

bool FaultyFiles::isStalled() const {
  const std::lock_guard lock(mutex_);
  return stalled_;
}

FaultyFiles::Verdict FaultyFiles::judge(Call call) {
  std::unique_lock lock(mutex_);
  if (stalls_ && call == stalling_) {
    stalled_ = true;
    goesOn_.wait(lock, [this] { return !stalls_; });
    stalled_ = false;
  }
  if (!armed_ || call != call_) return {};
  if (until_ > 0) {
    --until_;
    return {};
  }
  armed_ = --times_ > 0;
  failed_ = true;
  return {true, fault_};
}

}  // namespace tarn::recorder
