#include "host/settings/FileNotificationCenter.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <system_error>
#include <utility>

#include "host/log/HostLog.h"
#include "host/settings/StateFolder.h"
#include "host/system/FileLock.h"
#include "platform/WorkQueue.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "FileNotificationCenter";
constexpr unsigned kFolderMode = 0750;
constexpr mode_t kFileMode = 0640;
constexpr std::chrono::milliseconds kLockPatience{1000};
constexpr int kRetryMilliseconds = 1000;  // how soon a folder that can't be watched is tried again
constexpr std::size_t kWordBytes = 8;
constexpr std::uint32_t kPosts = IN_MODIFY | IN_MOVED_TO;
constexpr std::uint32_t kFolderGone = IN_IGNORED | IN_DELETE_SELF | IN_MOVE_SELF | IN_UNMOUNT;

using Word = std::array<unsigned char, kWordBytes>;

std::optional<std::uint64_t> readWord(int file) {
  struct stat facts {};
  Word bytes{};
  if (::fstat(file, &facts) != 0 || !S_ISREG(facts.st_mode) ||
      ::pread(file, bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) {
    return std::nullopt;
  }
  std::uint64_t word = 0;
  for (std::size_t index = kWordBytes; index-- > 0;) {
    word = (word << 8U) | bytes[index];
  }
  return word;
}

// 0 or an errno value. One write: one post.
int writeWord(int file, std::uint64_t word) {
  Word bytes{};
  for (unsigned char& byte : bytes) {
    byte = static_cast<unsigned char>(word & 0xFFU);
    word >>= 8U;
  }
  const ssize_t written = ::pwrite(file, bytes.data(), bytes.size(), 0);
  if (written < 0) {
    return errno;
  }
  return written == static_cast<ssize_t>(bytes.size()) ? 0 : ENOSPC;
}

}  // namespace

FileNotificationCenter::Entry::Entry(std::string itsName, std::int32_t itsToken,
                                     std::shared_ptr<platform::WorkQueue> itsQueue, Handler itsHandler)
    : name(std::move(itsName)), token(itsToken), queue(std::move(itsQueue)), handler(std::move(itsHandler)) {}

FileNotificationCenter::FileNotificationCenter(std::string folder, platform::Log& log)
    : folder_(std::move(folder)), log_(log) {}

FileNotificationCenter::~FileNotificationCenter() {
  if (thread_.joinable()) {
    ::eventfd_write(stop_.get(), 1);
    thread_.join();
  }
}

platform::NotificationCenter::Registration FileNotificationCenter::registerFor(
    std::string_view name, std::shared_ptr<platform::WorkQueue> queue, Handler handler) {
  if (!isPlainName(name)) {
    return {EINVAL, -1};
  }
  const std::lock_guard lock(mutex_);
  if (entries_.size() == kMaximumRegistrations) {
    return {ENOSPC, -1};
  }
  if (!thread_.joinable()) {
    if (const int error = startWatching(); error != 0) {
      return {error, -1};
    }
  }
  const std::int32_t token = ++lastToken_;
  entries_.emplace(token, std::make_shared<Entry>(std::string(name), token, std::move(queue), std::move(handler)));
  return {kStatusOk, token};
}

std::optional<std::uint64_t> FileNotificationCenter::state(std::int32_t token) const {
  std::string path = folder_ + "/";
  {
    const std::lock_guard lock(mutex_);
    const auto at = entries_.find(token);
    if (at == entries_.end()) {
      return std::nullopt;
    }
    path += at->second->name;
  }
  const UniqueDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  return file ? readWord(file.get()) : std::nullopt;
}

void FileNotificationCenter::cancel(std::int32_t token) {
  const std::lock_guard lock(mutex_);
  const auto at = entries_.find(token);
  if (at != entries_.end()) {
    at->second->cancelled = true;
    entries_.erase(at);
  }
}

bool FileNotificationCenter::post(std::string_view name, std::optional<std::uint64_t> state) {
  const std::string fault = write(name, state);
  if (!fault.empty()) {
    hostLog(log_, kHostCategory, platform::LogLevel::Error, kModule, "notification not posted: " + fault);
  }
  return fault.empty();
}

std::string FileNotificationCenter::write(std::string_view name, std::optional<std::uint64_t> state) const {
  if (!isPlainName(name)) {
    return "\"" + std::string(name) + "\" can't name a notification";
  }
  if (const int error = makeFolder(folder_, kFolderMode); error != 0) {
    return folder_ + errorSuffix(error);
  }
  const std::string path = folder_ + "/" + std::string(name);
  struct stat facts {};
  const bool existed = ::stat(path.c_str(), &facts) == 0;
  const UniqueDescriptor file(
      ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW, kFileMode));
  if (!file) {
    return path + errorSuffix(errno);
  }
  if (!existed) {
    giveToFolderOwner(file.get(), folder_);
  }
  int error = FileLock::take(file.get(), kLockPatience);
  if (error == 0) {
    error = writeWord(file.get(), state ? *state : readWord(file.get()).value_or(0));
  }
  return error == 0 ? std::string() : path + errorSuffix(error);
}

// Makes what the thread needs and starts it; 0 or an errno value. Called with the lock held.
int FileNotificationCenter::startWatching() {
  events_ = UniqueDescriptor(::inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  stop_ = UniqueDescriptor(events_ ? ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK) : -1);
  if (!stop_) {
    return errno;
  }
  if (const int error = watchFolder(); error != 0) {
    return error;
  }
  // The process's signals are for the thread that waits for them; a new thread inherits what is blocked here.
  sigset_t all;
  sigset_t before;
  ::sigfillset(&all);
  ::pthread_sigmask(SIG_SETMASK, &all, &before);
  int error = 0;
  try {
    thread_ = std::thread([this] { watch(); });
  } catch (const std::system_error& failure) {
    error = failure.code().value();
  }
  ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
  return error;
}

int FileNotificationCenter::watchFolder() {
  if (const int error = makeFolder(folder_, kFolderMode); error != 0) {
    return error;
  }
  watch_ = ::inotify_add_watch(events_.get(), folder_.c_str(),
                               kPosts | IN_DELETE_SELF | IN_MOVE_SELF | IN_ONLYDIR | IN_EXCL_UNLINK);
  return watch_ < 0 ? errno : 0;
}

void FileNotificationCenter::watch() {
  std::array<pollfd, 2> waits{pollfd{stop_.get(), POLLIN, 0}, pollfd{events_.get(), POLLIN, 0}};
  while (true) {
    const int ready = ::poll(waits.data(), waits.size(), watch_ < 0 ? kRetryMilliseconds : -1);
    if (ready > 0 && waits[0].revents != 0) {
      return;
    }
    if (ready > 0 && waits[1].revents != 0) {
      while (readEvents()) {
      }
    }
    if (watch_ < 0) {
      renewWatch();
    }
  }
}

// One gulp of events; whether there was any.
bool FileNotificationCenter::readEvents() {
  alignas(inotify_event) std::array<char, 16384> buffer;
  const ssize_t length = ::read(events_.get(), buffer.data(), buffer.size());
  if (length <= 0) {
    return false;
  }
  const auto end = static_cast<std::size_t>(length);
  for (std::size_t at = 0; at + sizeof(inotify_event) <= end;) {
    inotify_event event{};
    std::memcpy(&event, buffer.data() + at, sizeof event);
    const char* name = buffer.data() + at + sizeof event;
    handleEvent(event.wd, event.mask,
                event.len == 0 ? std::string_view() : std::string_view(name, ::strnlen(name, event.len)));
    at += sizeof event + event.len;
  }
  return true;
}

void FileNotificationCenter::handleEvent(int watch, std::uint32_t mask, std::string_view name) {
  if ((mask & IN_Q_OVERFLOW) != 0) {
    deliverAll();
  } else if ((mask & kFolderGone) != 0) {
    if (watch == watch_) {  // the last words of an earlier watch come late
      ::inotify_rm_watch(events_.get(), std::exchange(watch_, -1));
      hostLog(log_, kHostCategory, platform::LogLevel::Error, kModule, folder_ + " went away; it is made anew");
    }
  } else if ((mask & kPosts) != 0) {
    deliver(name);
  }
}

// Watches the folder again. Posts may have been missed since it went away.
void FileNotificationCenter::renewWatch() {
  if (watchFolder() == 0) {
    deliverAll();
  }
}

void FileNotificationCenter::deliver(std::string_view name) {
  std::vector<std::shared_ptr<Entry>> wanted;
  {
    const std::lock_guard lock(mutex_);
    for (const auto& [token, entry] : entries_) {
      if (entry->name == name) {
        wanted.push_back(entry);
      }
    }
  }
  handOver(wanted);
}

void FileNotificationCenter::deliverAll() {
  std::vector<std::shared_ptr<Entry>> wanted;
  {
    const std::lock_guard lock(mutex_);
    for (const auto& [token, entry] : entries_) {
      wanted.push_back(entry);
    }
  }
  handOver(wanted);
}

void FileNotificationCenter::handOver(const std::vector<std::shared_ptr<Entry>>& entries) {
  for (const std::shared_ptr<Entry>& entry : entries) {
    if (entry->waiting.exchange(true)) {
      continue;
    }
    entry->queue->async([entry] {
      entry->waiting = false;
      if (!entry->cancelled) {
        entry->handler(entry->token);
      }
    });
  }
}

}  // namespace tarn::linux_host
