// LinuxConditions: condition variables. A wait on the server queue, and work that blocks it on purpose, is told to the
// watchdog; while a wait lasts, the main loop serves its sockets.
//
// Owned by the platform; outlives the conditions that it made. Threads: any.
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

  std::shared_ptr<platform::Condition> makeCondition() override;
  std::shared_ptr<void> blockOnPurpose() override;

 private:
  MainLoop& loop_;
};

}  // namespace tarn::linux_host
