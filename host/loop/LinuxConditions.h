// LinuxConditions: condition variables. A wait on the server queue is told to the watchdog as a deliberate one, and the
// main loop serves its sockets meanwhile.
//
// Owned by the entry point; outlives the conditions that it made. Threads: any.
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

 private:
  MainLoop& loop_;
};

}  // namespace tarn::linux_host
