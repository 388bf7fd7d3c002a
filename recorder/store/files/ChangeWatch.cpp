// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/ChangeWatch.h"

#include <poll.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <ctime>
#include <string_view>

namespace tarn::recorder {

namespace {

constexpr unsigned kWanted = IN_MODIFY | IN_CREATE | IN_MOVED_TO | IN_ONLYDIR;
constexpr std::size_t kBytesAtOnce = 4096;

}  // namespace

ChangeWatch::ChangeWatch(const std::filesystem::path& file)
    : folder_(file.has_parent_path() ? file.parent_path().string() : "."), name_(file.filename().string()) {}

ChangeWatch::~ChangeWatch() {
  if (events_ >= 0) {
    ::close(events_);
  }
}

void ChangeWatch::begin() {
  if (events_ < 0) {
    events_ = ::inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
  }
  if (events_ >= 0 && folderWatch_ < 0) {
    folderWatch_ = ::inotify_add_watch(events_, folder_.c_str(), kWanted);
  }
}

bool ChangeWatch::wait(std::chrono::microseconds timeout) {
  begin();
  const auto seconds = std::chrono::floor<std::chrono::seconds>(timeout);
  const timespec time{static_cast<std::time_t>(seconds.count()),
                      static_cast<long>(std::chrono::nanoseconds(timeout - seconds).count())};
  pollfd polled{events_, POLLIN, 0};  // none at all is only waited with
  return ::ppoll(&polled, 1, &time, nullptr) > 0 && takeNews();
}

// Reads all that waits; whether any of it is about the file.
bool ChangeWatch::takeNews() {
  bool isOurs = false;
  alignas(inotify_event) char bytes[kBytesAtOnce];
  for (ssize_t size = 0; (size = ::read(events_, bytes, sizeof bytes)) > 0;) {
    for (const char* at = bytes; at < bytes + size;) {
      const auto* const event = reinterpret_cast<const inotify_event*>(at);
      at += sizeof(inotify_event) + event->len;
      if ((event->mask & IN_IGNORED) != 0) {
        folderWatch_ = -1;  // the folder went away
      }
      isOurs = isOurs || (event->mask & IN_Q_OVERFLOW) != 0 ||
               (event->len > 0 && std::string_view(event->name).starts_with(name_));
    }
  }
  return isOurs;
}

}  // namespace tarn::recorder
