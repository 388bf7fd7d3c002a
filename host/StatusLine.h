// SPDX-License-Identifier: Apache-2.0
// StatusLine: the one line by which the service manager shows what the service is at.
//
// It is told when it has changed, and not before some seconds have passed since the last time. An idle service isn't
// woken for it: look() asks for a later look only when something came in, and again as long as something waits.
//
// Owned by the platform. Threads: the main loop's.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>

#include "host/loop/MainLoop.h"
#include "host/loop/ServiceManager.h"
#include "platform/UniqueFunction.h"

namespace tarn::linux_host {

// What the line tells.
struct StatusNumbers {
  std::uint64_t sessions = 0;
  std::uint64_t clients = 0;
  std::uint64_t waiting = 0;  // pieces of work
  std::uint64_t messages = 0;
};

// "12 sessions of 3 clients, 0 waiting, 1,234 messages".
std::string statusLineOf(const StatusNumbers& numbers);

class StatusLine {
 public:
  static constexpr std::chrono::seconds kBetween{5};
  using Source = platform::UniqueFunction<StatusNumbers()>;

  // Loop and manager outlive it, and the loop runs no more when it ends.
  StatusLine(MainLoop& loop, ServiceManager& manager, Source source)
      : loop_(loop), manager_(manager), source_(std::move(source)) {}
  StatusLine(const StatusLine&) = delete;
  StatusLine& operator=(const StatusLine&) = delete;

  // Tells it now, and from now on when it changes. Where nobody listens, nothing is done.
  void start();
  // Once a turn: `activity` is another number when something may have changed. Nearly free.
  void look(std::uint64_t activity) {
    if (!started_ || lookIsDue_ || activity == activity_) return;
    activity_ = activity;
    lookLater();
  }

 private:
  void lookLater();
  void tell();

  MainLoop& loop_;
  ServiceManager& manager_;
  Source source_;
  bool started_ = false;
  bool lookIsDue_ = false;  // a timer is set
  std::uint64_t activity_ = 0;
  std::string told_;
};

}  // namespace tarn::linux_host
