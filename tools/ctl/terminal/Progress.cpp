// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/Progress.h"

#include <poll.h>
#include <sys/eventfd.h>

#include <algorithm>
#include <cmath>
#include <system_error>
#include <utility>

#include "host/system/Files.h"

namespace tarn::ctl {

namespace {

using std::chrono::milliseconds;

constexpr milliseconds kBetween{250};
// To the line's beginning, and nothing more on it.
constexpr const char* kEmptyLine = "\r\x1b[K";

bool isOverWithin(int end, milliseconds time) {
  pollfd polled{end, POLLIN, 0};
  return ::poll(&polled, 1, static_cast<int>(time.count())) != 0;
}

}  // namespace

Progress::Progress(const ProgressPlace& place, std::string what) : place_(place), what_(std::move(what)) {
  if (!place_.isTold) return;
  end_ = linux_host::UniqueDescriptor(::eventfd(0, EFD_CLOEXEC));
  if (!end_) return;
  try {
    thread_ = std::thread([this] { run(); });
  } catch (const std::system_error&) {
    // The work goes on without a word about it.
  }
}

Progress::~Progress() {
  if (!thread_.joinable()) return;
  static_cast<void>(::eventfd_write(end_.get(), 1));
  thread_.join();
}

// A terminal that is gone takes nothing: that is found out by whoever prints results.
void Progress::run() {
  if (isOverWithin(end_.get(), place_.after)) return;
  do {
    static_cast<void>(linux_host::writeAll(place_.fd, kEmptyLine + line()));
  } while (!isOverWithin(end_.get(), kBetween));
  static_cast<void>(linux_host::writeAll(place_.fd, kEmptyLine));
}

std::string Progress::line() const {
  const auto seconds = std::chrono::floor<std::chrono::seconds>(std::chrono::steady_clock::now() - start_).count();
  const double part = part_.load(std::memory_order_relaxed);
  const std::string share = part < 0 ? "" : ", " + std::to_string(std::lround(std::min(part, 1.0) * 100)) + "%";
  return what_ + share + ", " + std::to_string(seconds) + " s";
}

}  // namespace tarn::ctl
