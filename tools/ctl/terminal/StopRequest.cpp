// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/StopRequest.h"

#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>

namespace tarn::ctl {

namespace {

using std::chrono::milliseconds;

// A signal that comes just before a wait is seen at its end, so no wait is long.
constexpr milliseconds kPatience{200};

volatile std::sig_atomic_t stopRequested = 0;

void requestStop(int /*signal*/) {
  stopRequested = 1;
}

// Whether the reader left, or leaves within that time.
bool readerLeaves(milliseconds within) {
  pollfd polled{STDOUT_FILENO, 0, 0};
  return ::poll(&polled, 1, static_cast<int>(within.count())) > 0 && (polled.revents & (POLLERR | POLLHUP)) != 0;
}

}  // namespace

void stopOnSignals() {
  struct sigaction action {};
  action.sa_handler = requestStop;
  ::sigaction(SIGINT, &action, nullptr);
  ::sigaction(SIGTERM, &action, nullptr);
}

bool isStopRequested() {
  return stopRequested != 0 || readerLeaves(milliseconds(0));
}

bool pauseUnlessStopped(std::chrono::duration<double> pause) {
  using Clock = std::chrono::steady_clock;
  const auto until = Clock::now() + std::chrono::ceil<Clock::duration>(pause);
  while (stopRequested == 0) {
    const auto left = std::chrono::ceil<milliseconds>(until - Clock::now());
    if (left.count() <= 0) return true;
    if (readerLeaves(std::min(left, kPatience))) return false;
  }
  return false;
}

}  // namespace tarn::ctl
