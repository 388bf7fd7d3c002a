// SPDX-License-Identifier: Apache-2.0
// LinuxConditions: condition variables. A wait on the server queue, and work that blocks it on purpose, is told to the
// watchdog; while a wait lasts, the main loop serves its sockets.
//
// Owned by the platform; outlives the conditions that it made. Threads: any.
//
// A wait anywhere else is that of a condition variable of the language. One on the server queue goes through
// MainLoop::waitUntil(), in which clients are accepted and replies go out but no other work of the queue runs, so the
// state that the waiting worker holds doesn't change under it.
#pragma once

#include "host/loop/MainLoop.h"
#include "platform/Condition.h"

namespace tarn::linux_host {

class LinuxConditions final : public platform::Conditions {
 public:
  // The loop outlives the waits.
  explicit LinuxConditions(MainLoop& loop) : loop_(loop) {}
  LinuxConditions(const LinuxConditions&) = delete;
  LinuxConditions& operator=(const LinuxConditions&) = delete;

  // Never null. The condition keeps the server queue alive, so a back-end may signal it after the loop's end; nobody
  // may wait then. Timeouts are held to zero and a year; what is no number doesn't wait.
  std::shared_ptr<platform::Condition> makeCondition() override;
  // The handle tells the watchdog of the end when it is destroyed. Null off the server queue, where nobody watches.
  // Neither it nor a wait within it nests: the inner end would end the outer one to the watchdog too.
  std::shared_ptr<void> blockOnPurpose() override;

 private:
  MainLoop& loop_;
};

}  // namespace tarn::linux_host
