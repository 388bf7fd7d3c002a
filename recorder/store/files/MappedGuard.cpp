// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/MappedGuard.h"

#include <sqlite3.h>
#include <sys/mman.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <mutex>

#include "recorder/store/files/SqliteStart.h"

namespace tarn::recorder {

namespace {

struct Range {
  std::atomic<std::uintptr_t> begin{0};
  std::atomic<std::uintptr_t> end{0};
};

// What a signal handler can reach. One connection maps one range for each 4096 pages of its log.
struct Guarded {
  std::array<Range, 1024> ranges;
  std::atomic<std::uint64_t> torn{0};
  std::atomic<std::size_t> pageBytes{4096};
  struct sigaction before {};
};
Guarded guarded;

void passOn(int number, siginfo_t* info, void* context) {
  if ((guarded.before.sa_flags & SA_SIGINFO) != 0 && guarded.before.sa_sigaction != nullptr) {
    guarded.before.sa_sigaction(number, info, context);
  } else if (guarded.before.sa_handler != SIG_DFL && guarded.before.sa_handler != SIG_IGN) {
    guarded.before.sa_handler(number);
  } else {
    ::signal(number, SIG_DFL);  // the instruction is run again, and ends the process as it would have
  }
}

void handle(int number, siginfo_t* info, void* context) {
  const auto at = reinterpret_cast<std::uintptr_t>(info->si_addr);
  for (const Range& range : guarded.ranges) {
    if (at < range.begin.load() || at >= range.end.load()) continue;
    const std::size_t bytes = guarded.pageBytes.load();
    void* const page = reinterpret_cast<void*>(at / bytes * bytes);
    const void* const zeros =
        ::mmap(page, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_FIXED, -1, 0);
    if (zeros == MAP_FAILED) break;
    guarded.torn.fetch_add(1);
    return;
  }
  passOn(number, info, context);
}

void install() {
  guarded.pageBytes = static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
  struct sigaction action {};
  action.sa_sigaction = handle;
  action.sa_flags = SA_SIGINFO;
  ::sigaction(SIGBUS, &action, &guarded.before);
}

void* mapForSqlite(void* hint, std::size_t size, int protection, int flags, int file, off_t at) {
  void* const memory = ::mmap(hint, size, protection, flags, file, at);
  if (memory != MAP_FAILED) {
    static_cast<void>(MappedGuard::guard(memory, size));
  }
  return memory;
}

int unmapForSqlite(void* memory, std::size_t size) {
  MappedGuard::forget(memory);
  return ::munmap(memory, size);
}

}  // namespace

bool MappedGuard::guard(void* memory, std::size_t size) noexcept {
  static std::once_flag once;
  std::call_once(once, install);
  const auto begin = reinterpret_cast<std::uintptr_t>(memory);
  for (Range& range : guarded.ranges) {
    std::uintptr_t free = 0;
    if (!range.begin.compare_exchange_strong(free, begin)) continue;
    range.end = begin + size;
    return true;
  }
  return false;
}

void MappedGuard::forget(void* memory) noexcept {
  const auto begin = reinterpret_cast<std::uintptr_t>(memory);
  for (Range& range : guarded.ranges) {
    if (range.begin.load() != begin) continue;
    range.end = 0;
    range.begin = 0;
    return;
  }
}

void MappedGuard::guardSqlite() noexcept {
  static std::once_flag once;
  std::call_once(once, [] {
    startSqlite();
    sqlite3_vfs* const files = sqlite3_vfs_find("unix");
    if (files == nullptr || files->xSetSystemCall == nullptr) return;
    files->xSetSystemCall(files, "mmap", reinterpret_cast<sqlite3_syscall_ptr>(mapForSqlite));
    files->xSetSystemCall(files, "munmap", reinterpret_cast<sqlite3_syscall_ptr>(unmapForSqlite));
  });
}

std::uint64_t MappedGuard::torn() noexcept {
  return guarded.torn.load();
}

}  // namespace tarn::recorder
