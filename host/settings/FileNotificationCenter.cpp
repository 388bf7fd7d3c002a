// SPDX-License-Identifier: Apache-2.0
#include "host/settings/FileNotificationCenter.h"

#include <sys/epoll.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "host/settings/PlainName.h"
#include "host/system/SystemError.h"
#include "platform/WorkQueue.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "FileNotificationCenter";
constexpr std::chrono::seconds kRetry{1};  // how soon a folder that can't be watched is tried again
constexpr std::uint32_t kPosts = IN_MODIFY | IN_MOVED_TO;
constexpr std::uint32_t kFolderGone = IN_IGNORED | IN_DELETE_SELF | IN_MOVE_SELF | IN_UNMOUNT;

}  // namespace

FileNotificationCenter::FileNotificationCenter(std::string folder, MainLoop& loop, platform::Log& log)
    : folder_(std::move(folder)), loop_(loop), log_(log) {}

platform::NotificationCenter::Registration FileNotificationCenter::registerFor(
    std::string_view name, std::shared_ptr<platform::WorkQueue> queue, Handler handler) {
  if (!isPlainName(name)) return {EINVAL, -1};
  if (entries_.size() == kMaximumRegistrations) return {ENOSPC, -1};
  if (const Status watching = watched_ ? Status() : startWatching(); watching.failed()) {
    return {static_cast<std::int32_t>(watching->code), -1};
  }
  const std::int32_t token = ++lastToken_;
  entries_.emplace(token,
                   std::make_shared<Entry>(Entry{std::string(name), token, std::move(queue), std::move(handler)}));
  return {kStatusOk, token};
}

std::optional<std::uint64_t> FileNotificationCenter::state(std::int32_t token) const {
  const auto at = entries_.find(token);
  return at != entries_.end() ? folder_.state(at->second->name) : std::nullopt;
}

void FileNotificationCenter::cancel(std::int32_t token) {
  const auto at = entries_.find(token);
  if (at != entries_.end()) {
    at->second->cancelled = true;
    entries_.erase(at);
  }
}

bool FileNotificationCenter::post(std::string_view name, std::optional<std::uint64_t> state) {
  const Status posted = folder_.post(name, state);
  if (posted.failed()) {
    logPrefixed(log_, kHostCategory, platform::LogLevel::Error, kModule, "notification not posted: " + posted->text);
  }
  return posted.ok();
}

Status FileNotificationCenter::startWatching() {
  events_ = UniqueDescriptor(::inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (!events_) return lastSystemError();
  if (Status watching = watchFolder(); watching.failed()) return watching;
  Status watching = loop_.watch(events_.get(), EPOLLIN, shared_from_this());
  watched_ = watching.ok();
  return watching;
}

Status FileNotificationCenter::watchFolder() {
  if (Status made = folder_.make(); made.failed()) return made;
  watch_ = ::inotify_add_watch(events_.get(), folder_.path().c_str(),
                               kPosts | IN_DELETE_SELF | IN_MOVE_SELF | IN_ONLYDIR | IN_EXCL_UNLINK);
  return watch_ < 0 ? lastSystemError() : Status();
}

// One gulp of changes; the loop calls again while there are more.
void FileNotificationCenter::handleEvents(std::uint32_t) {
  alignas(inotify_event) std::array<char, 16384> buffer;
  const ssize_t length = ::read(events_.get(), buffer.data(), buffer.size());
  if (length <= 0) return;
  const auto end = static_cast<std::size_t>(length);
  for (std::size_t at = 0; at + sizeof(inotify_event) <= end;) {
    inotify_event event{};
    std::memcpy(&event, buffer.data() + at, sizeof event);
    const char* name = buffer.data() + at + sizeof event;
    handleEvent(event.wd, event.mask,
                event.len == 0 ? std::string_view() : std::string_view(name, ::strnlen(name, event.len)));
    at += sizeof event + event.len;
  }
}

void FileNotificationCenter::handleEvent(int watch, std::uint32_t mask, std::string_view name) {
  if ((mask & IN_Q_OVERFLOW) != 0) {
    deliverAll();
  } else if ((mask & kFolderGone) != 0) {
    if (watch == watch_) {  // the last words of an earlier watch come late
      ::inotify_rm_watch(events_.get(), std::exchange(watch_, -1));
      logPrefixed(log_, kHostCategory, platform::LogLevel::Error, kModule,
                  folder_.path() + " went away; it is made anew");
      renewWatch();
    }
  } else if ((mask & kPosts) != 0) {
    deliver(name);
  }
}

// Watches the folder again, now or as soon as that is possible. Posts may have been missed since it went away.
void FileNotificationCenter::renewWatch() {
  if (watchFolder().ok()) {
    deliverAll();
    return;
  }
  loop_.queue()->asyncAfter(kRetry, [weakSelf = weak_from_this()] {
    if (const auto self = weakSelf.lock()) {
      self->renewWatch();
    }
  });
}

void FileNotificationCenter::deliver(std::string_view name) {
  for (const auto& [token, entry] : entries_) {
    if (entry->name == name) {
      handOver(entry);
    }
  }
}

void FileNotificationCenter::deliverAll() {
  for (const auto& [token, entry] : entries_) {
    handOver(entry);
  }
}

void FileNotificationCenter::handOver(const std::shared_ptr<Entry>& entry) {
  if (std::exchange(entry->waiting, true)) return;
  try {
    entry->queue->async([entry] {
      entry->waiting = false;
      if (!entry->cancelled) {
        entry->handler(entry->token);
      }
    });
  } catch (...) {
    entry->waiting = false;  // or it would never be told again
    throw;
  }
}

}  // namespace tarn::linux_host
