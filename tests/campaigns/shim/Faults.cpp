// SPDX-License-Identifier: Apache-2.0
// Faults: counts the system calls of a program by kind, and lets one of them fail or do half of what it should, or all
// of some kinds fail for a while. What to do stands in the control page.
//
// A site is where in the program a call comes from: its callers up to some depth. Where TARN_SHIM_SITES names a file,
// kind and site of each call are appended to it.
#include <execinfo.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>

#include "tests/campaigns/shim/Control.h"

namespace tarn::campaigns {

namespace {

// In the order of tests/campaigns/control.py.
enum class Kind : std::size_t {
  Open,
  Read,
  PRead,
  Write,
  PWrite,
  Sync,
  Truncate,
  Map,
  Stat,
  Receive,
  Send,
  Accept,
  Wait,
  Watch,
  Rename,
  Remove,
  Folder,
  Lock,
  Socket,
};

// So deep, the store's calls are told apart by what they are made for; deeper, by what else was going on.
constexpr int kSiteDepth = 8;

void* baseOf(void* address) noexcept {
  Dl_info info{};
  return ::dladdr(address, &info) != 0 ? info.dli_fbase : nullptr;
}

// The same in each run, wherever the parts of the program are loaded. Never 0.
std::uint64_t siteOfCall() noexcept {
  constexpr std::uint64_t kPrime = 1099511628211U;
  std::array<void*, kSiteDepth + 6> frames{};
  const int count = ::backtrace(frames.data(), static_cast<int>(frames.size()));
  void* const own = baseOf(reinterpret_cast<void*>(&siteOfCall));
  std::uint64_t site = 14695981039346656037U;
  int depth = 0;
  for (int i = 0; i < count && depth < kSiteDepth; ++i) {
    void* const frame = frames[static_cast<std::size_t>(i)];
    void* const base = baseOf(frame);
    if (base == own) continue;
    const auto place = static_cast<std::uint64_t>(static_cast<char*>(frame) - static_cast<char*>(base));
    site = (site ^ place) * kPrime;
    ++depth;
  }
  return site | 1U;
}

int openSites() noexcept {
  const char* const path = std::getenv("TARN_SHIM_SITES");
  if (path == nullptr) return -1;
  return static_cast<int>(::syscall(SYS_openat, AT_FDCWD, path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600));
}

void noteSite(Kind kind) noexcept {
  static const int file = openSites();
  if (file < 0) return;
  const std::array<std::uint64_t, 2> entry{static_cast<std::uint64_t>(kind), siteOfCall()};
  ::syscall(SYS_write, file, entry.data(), sizeof entry);
}

// Whether this call, one of the kind that is to fail, is the one.
bool isMeant(Words* words, std::uint64_t ordinal) noexcept {
  const std::uint64_t wanted = word(words, Word::FaultOrdinal).load();
  const std::uint64_t site = word(words, Word::FaultSite).load();
  if (site == 0) return ordinal == wanted;
  return siteOfCall() == site && word(words, Word::SiteCalls).fetch_add(1) + 1 == wanted;
}

// What this call is to do: 0 its work, kShort half of it, anything else an errno value to fail with.
std::uint64_t actionFor(Kind kind) noexcept {
  Words* const words = controlWords();
  if (words == nullptr) return 0;
  const auto place = static_cast<std::size_t>(kind);
  const std::uint64_t ordinal = word(words, Word::FirstCounter, place).fetch_add(1) + 1;
  if ((word(words, Word::StickyKinds).load() >> place & 1U) != 0) {
    word(words, Word::Fired).fetch_add(1);
    return word(words, Word::StickyError).load();
  }
  noteSite(kind);
  if (word(words, Word::FaultKind).load() != place + 1 || !isMeant(words, ordinal)) return 0;
  word(words, Word::Fired).fetch_add(1);
  return word(words, Word::FaultAction).load();
}

// Whether a call that can't be halved fails; errno is set then.
bool fails(Kind kind) noexcept {
  const std::uint64_t action = actionFor(kind);
  if (action == 0 || action == kShort) return false;
  errno = static_cast<int>(action);
  return true;
}

// Whether a call that moves bytes fails; `size` becomes half when it is to be short.
bool failsOrShortens(Kind kind, std::size_t& size) noexcept {
  const std::uint64_t action = actionFor(kind);
  if (action == kShort) {
    size = std::max<std::size_t>(size / 2, std::min<std::size_t>(size, 1));
    return false;
  }
  if (action != 0) {
    errno = static_cast<int>(action);
  }
  return action != 0;
}

// A disk that has other things to do for a while.
void delaySync() noexcept {
  Words* const words = controlWords();
  if (words == nullptr) return;
  const std::uint64_t milliseconds = word(words, Word::SyncDelay).exchange(0);
  if (milliseconds == 0) return;
  word(words, Word::Delays).fetch_add(1);
  ::poll(nullptr, 0, static_cast<int>(milliseconds));
}

bool wantsMode(int flags) noexcept {
  return (flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE;
}

}  // namespace

// By other names in here, so that the library's own declarations needn't be met exactly.
extern "C" {

int tarnOpen(const char* path, int flags, ...) __asm__("open");
int tarnOpen(const char* path, int flags, ...) {
  static const auto next = nextFunction<int(const char*, int, ...)>("open");
  std::va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = wantsMode(flags) ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  return fails(Kind::Open) ? -1 : next(path, flags, mode);
}

int tarnOpen64(const char* path, int flags, ...) __asm__("open64");
int tarnOpen64(const char* path, int flags, ...) {
  static const auto next = nextFunction<int(const char*, int, ...)>("open64");
  std::va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = wantsMode(flags) ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  return fails(Kind::Open) ? -1 : next(path, flags, mode);
}

int tarnOpenAt(int folder, const char* path, int flags, ...) __asm__("openat");
int tarnOpenAt(int folder, const char* path, int flags, ...) {
  static const auto next = nextFunction<int(int, const char*, int, ...)>("openat");
  std::va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = wantsMode(flags) ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  return fails(Kind::Open) ? -1 : next(folder, path, flags, mode);
}

int tarnOpenChecked(const char* path, int flags) __asm__("__open_2");
int tarnOpenChecked(const char* path, int flags) {
  return tarnOpen(path, flags);
}

int tarnOpen64Checked(const char* path, int flags) __asm__("__open64_2");
int tarnOpen64Checked(const char* path, int flags) {
  return tarnOpen64(path, flags);
}

int tarnOpenAtChecked(int folder, const char* path, int flags) __asm__("__openat_2");
int tarnOpenAtChecked(int folder, const char* path, int flags) {
  return tarnOpenAt(folder, path, flags);
}

ssize_t tarnRead(int file, void* data, std::size_t size) __asm__("read");
ssize_t tarnRead(int file, void* data, std::size_t size) {
  static const auto next = nextFunction<ssize_t(int, void*, std::size_t)>("read");
  return failsOrShortens(Kind::Read, size) ? -1 : next(file, data, size);
}

ssize_t tarnReadChecked(int file, void* data, std::size_t size, std::size_t) __asm__("__read_chk");
ssize_t tarnReadChecked(int file, void* data, std::size_t size, std::size_t) {
  return tarnRead(file, data, size);
}

ssize_t tarnPRead(int file, void* data, std::size_t size, off_t at) __asm__("pread");
ssize_t tarnPRead(int file, void* data, std::size_t size, off_t at) {
  static const auto next = nextFunction<ssize_t(int, void*, std::size_t, off_t)>("pread");
  return failsOrShortens(Kind::PRead, size) ? -1 : next(file, data, size, at);
}

ssize_t tarnPRead64(int file, void* data, std::size_t size, off64_t at) __asm__("pread64");
ssize_t tarnPRead64(int file, void* data, std::size_t size, off64_t at) {
  static const auto next = nextFunction<ssize_t(int, void*, std::size_t, off64_t)>("pread64");
  return failsOrShortens(Kind::PRead, size) ? -1 : next(file, data, size, at);
}

ssize_t tarnPReadChecked(int file, void* data, std::size_t size, off_t at, std::size_t) __asm__("__pread_chk");
ssize_t tarnPReadChecked(int file, void* data, std::size_t size, off_t at, std::size_t) {
  return tarnPRead(file, data, size, at);
}

ssize_t tarnPRead64Checked(int file, void* data, std::size_t size, off64_t at, std::size_t) __asm__("__pread64_chk");
ssize_t tarnPRead64Checked(int file, void* data, std::size_t size, off64_t at, std::size_t) {
  return tarnPRead64(file, data, size, at);
}

ssize_t tarnWrite(int file, const void* data, std::size_t size) __asm__("write");
ssize_t tarnWrite(int file, const void* data, std::size_t size) {
  static const auto next = nextFunction<ssize_t(int, const void*, std::size_t)>("write");
  return failsOrShortens(Kind::Write, size) ? -1 : next(file, data, size);
}

ssize_t tarnPWrite(int file, const void* data, std::size_t size, off_t at) __asm__("pwrite");
ssize_t tarnPWrite(int file, const void* data, std::size_t size, off_t at) {
  static const auto next = nextFunction<ssize_t(int, const void*, std::size_t, off_t)>("pwrite");
  return failsOrShortens(Kind::PWrite, size) ? -1 : next(file, data, size, at);
}

ssize_t tarnPWrite64(int file, const void* data, std::size_t size, off64_t at) __asm__("pwrite64");
ssize_t tarnPWrite64(int file, const void* data, std::size_t size, off64_t at) {
  static const auto next = nextFunction<ssize_t(int, const void*, std::size_t, off64_t)>("pwrite64");
  return failsOrShortens(Kind::PWrite, size) ? -1 : next(file, data, size, at);
}

int tarnSync(int file) __asm__("fsync");
int tarnSync(int file) {
  static const auto next = nextFunction<int(int)>("fsync");
  delaySync();
  return fails(Kind::Sync) ? -1 : next(file);
}

int tarnDataSync(int file) __asm__("fdatasync");
int tarnDataSync(int file) {
  static const auto next = nextFunction<int(int)>("fdatasync");
  delaySync();
  return fails(Kind::Sync) ? -1 : next(file);
}

int tarnTruncate(int file, off_t size) __asm__("ftruncate");
int tarnTruncate(int file, off_t size) {
  static const auto next = nextFunction<int(int, off_t)>("ftruncate");
  return fails(Kind::Truncate) ? -1 : next(file, size);
}

int tarnTruncate64(int file, off64_t size) __asm__("ftruncate64");
int tarnTruncate64(int file, off64_t size) {
  static const auto next = nextFunction<int(int, off64_t)>("ftruncate64");
  return fails(Kind::Truncate) ? -1 : next(file, size);
}

int tarnAllocateSpace(int file, off64_t at, off64_t size) __asm__("posix_fallocate64");
int tarnAllocateSpace(int file, off64_t at, off64_t size) {
  static const auto next = nextFunction<int(int, off64_t, off64_t)>("posix_fallocate64");
  return fails(Kind::Truncate) ? errno : next(file, at, size);
}

void* tarnMap(void* place, std::size_t size, int access, int flags, int file, off64_t at) __asm__("mmap64");
void* tarnMap(void* place, std::size_t size, int access, int flags, int file, off64_t at) {
  static const auto next = nextFunction<void*(void*, std::size_t, int, int, int, off64_t)>("mmap64");
  // Memory without a file is another campaign's matter.
  const bool failed = file >= 0 && fails(Kind::Map);
  return failed ? reinterpret_cast<void*>(-1) : next(place, size, access, flags, file, at);
}

void* tarnMapShort(void* place, std::size_t size, int access, int flags, int file, off_t at) __asm__("mmap");
void* tarnMapShort(void* place, std::size_t size, int access, int flags, int file, off_t at) {
  return tarnMap(place, size, access, flags, file, at);
}

int tarnStat(const char* path, void* status) __asm__("stat");
int tarnStat(const char* path, void* status) {
  static const auto next = nextFunction<int(const char*, void*)>("stat");
  return fails(Kind::Stat) ? -1 : next(path, status);
}

int tarnStat64(const char* path, void* status) __asm__("stat64");
int tarnStat64(const char* path, void* status) {
  static const auto next = nextFunction<int(const char*, void*)>("stat64");
  return fails(Kind::Stat) ? -1 : next(path, status);
}

int tarnFileStat(int file, void* status) __asm__("fstat");
int tarnFileStat(int file, void* status) {
  static const auto next = nextFunction<int(int, void*)>("fstat");
  return fails(Kind::Stat) ? -1 : next(file, status);
}

int tarnFileStat64(int file, void* status) __asm__("fstat64");
int tarnFileStat64(int file, void* status) {
  static const auto next = nextFunction<int(int, void*)>("fstat64");
  return fails(Kind::Stat) ? -1 : next(file, status);
}

int tarnLinkStat(const char* path, void* status) __asm__("lstat");
int tarnLinkStat(const char* path, void* status) {
  static const auto next = nextFunction<int(const char*, void*)>("lstat");
  return fails(Kind::Stat) ? -1 : next(path, status);
}

int tarnLinkStat64(const char* path, void* status) __asm__("lstat64");
int tarnLinkStat64(const char* path, void* status) {
  static const auto next = nextFunction<int(const char*, void*)>("lstat64");
  return fails(Kind::Stat) ? -1 : next(path, status);
}

int tarnFolderStat(int folder, const char* path, void* status, int flags) __asm__("fstatat");
int tarnFolderStat(int folder, const char* path, void* status, int flags) {
  static const auto next = nextFunction<int(int, const char*, void*, int)>("fstatat");
  return fails(Kind::Stat) ? -1 : next(folder, path, status, flags);
}

ssize_t tarnReceive(int peer, void* data, std::size_t size, int flags) __asm__("recv");
ssize_t tarnReceive(int peer, void* data, std::size_t size, int flags) {
  static const auto next = nextFunction<ssize_t(int, void*, std::size_t, int)>("recv");
  return failsOrShortens(Kind::Receive, size) ? -1 : next(peer, data, size, flags);
}

ssize_t tarnReceiveChecked(int peer, void* data, std::size_t size, std::size_t, int flags) __asm__("__recv_chk");
ssize_t tarnReceiveChecked(int peer, void* data, std::size_t size, std::size_t, int flags) {
  return tarnReceive(peer, data, size, flags);
}

ssize_t tarnReceiveMessage(int peer, msghdr* message, int flags) __asm__("recvmsg");
ssize_t tarnReceiveMessage(int peer, msghdr* message, int flags) {
  static const auto next = nextFunction<ssize_t(int, msghdr*, int)>("recvmsg");
  return fails(Kind::Receive) ? -1 : next(peer, message, flags);
}

ssize_t tarnSend(int peer, const void* data, std::size_t size, int flags) __asm__("send");
ssize_t tarnSend(int peer, const void* data, std::size_t size, int flags) {
  static const auto next = nextFunction<ssize_t(int, const void*, std::size_t, int)>("send");
  return failsOrShortens(Kind::Send, size) ? -1 : next(peer, data, size, flags);
}

ssize_t tarnSendMessage(int peer, const msghdr* message, int flags) __asm__("sendmsg");
ssize_t tarnSendMessage(int peer, const msghdr* message, int flags) {
  static const auto next = nextFunction<ssize_t(int, const msghdr*, int)>("sendmsg");
  return fails(Kind::Send) ? -1 : next(peer, message, flags);
}

int tarnAccept(int listener, sockaddr* address, socklen_t* size, int flags) __asm__("accept4");
int tarnAccept(int listener, sockaddr* address, socklen_t* size, int flags) {
  static const auto next = nextFunction<int(int, sockaddr*, socklen_t*, int)>("accept4");
  return fails(Kind::Accept) ? -1 : next(listener, address, size, flags);
}

int tarnWait(int poller, epoll_event* events, int most, int patience) __asm__("epoll_wait");
int tarnWait(int poller, epoll_event* events, int most, int patience) {
  static const auto next = nextFunction<int(int, epoll_event*, int, int)>("epoll_wait");
  return fails(Kind::Wait) ? -1 : next(poller, events, most, patience);
}

int tarnWatch(int poller, int what, int file, epoll_event* event) __asm__("epoll_ctl");
int tarnWatch(int poller, int what, int file, epoll_event* event) {
  static const auto next = nextFunction<int(int, int, int, epoll_event*)>("epoll_ctl");
  return fails(Kind::Watch) ? -1 : next(poller, what, file, event);
}

int tarnRename(const char* from, const char* to) __asm__("rename");
int tarnRename(const char* from, const char* to) {
  static const auto next = nextFunction<int(const char*, const char*)>("rename");
  return fails(Kind::Rename) ? -1 : next(from, to);
}

int tarnUnlink(const char* path) __asm__("unlink");
int tarnUnlink(const char* path) {
  static const auto next = nextFunction<int(const char*)>("unlink");
  return fails(Kind::Remove) ? -1 : next(path);
}

int tarnMakeFolder(const char* path, mode_t mode) __asm__("mkdir");
int tarnMakeFolder(const char* path, mode_t mode) {
  static const auto next = nextFunction<int(const char*, mode_t)>("mkdir");
  return fails(Kind::Folder) ? -1 : next(path, mode);
}

int tarnControlFile(int file, int command, ...) __asm__("fcntl");
int tarnControlFile(int file, int command, ...) {
  static const auto next = nextFunction<int(int, int, ...)>("fcntl");
  std::va_list arguments;
  va_start(arguments, command);
  void* const argument = va_arg(arguments, void*);
  va_end(arguments);
  return fails(Kind::Lock) ? -1 : next(file, command, argument);
}

int tarnControlFile64(int file, int command, ...) __asm__("fcntl64");
int tarnControlFile64(int file, int command, ...) {
  static const auto next = nextFunction<int(int, int, ...)>("fcntl64");
  std::va_list arguments;
  va_start(arguments, command);
  void* const argument = va_arg(arguments, void*);
  va_end(arguments);
  return fails(Kind::Lock) ? -1 : next(file, command, argument);
}

int tarnLockFile(int file, int operation) __asm__("flock");
int tarnLockFile(int file, int operation) {
  static const auto next = nextFunction<int(int, int)>("flock");
  return fails(Kind::Lock) ? -1 : next(file, operation);
}

int tarnSocket(int domain, int type, int protocol) __asm__("socket");
int tarnSocket(int domain, int type, int protocol) {
  static const auto next = nextFunction<int(int, int, int)>("socket");
  return fails(Kind::Socket) ? -1 : next(domain, type, protocol);
}

}  // extern "C"

}  // namespace tarn::campaigns
