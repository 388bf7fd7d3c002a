// LinuxConditions: condition variables. A wait on the server queue, and work that blocks it on purpose, is told to the
// watchdog.
//
// Owned by the entry point; outlives the conditions that it made. Threads: any.
#pragma once

#include "platform/Clock.h"
#include "platform/Condition.h"
#include "platform/WorkQueue.h"
#include "platform/linux/QueueProgress.h"

namespace tarn::linux_host {

class LinuxConditions final : public platform::Conditions {
 public:
  LinuxConditions(const platform::Clock& clock, std::shared_ptr<platform::WorkQueue> serverQueue,
                  QueueProgress& progress);
  LinuxConditions(const LinuxConditions&) = delete;
  LinuxConditions& operator=(const LinuxConditions&) = delete;

  std::shared_ptr<platform::Condition> makeCondition() override;
  std::shared_ptr<void> blockOnPurpose() override;

 private:
  const platform::Clock& clock_;
  std::shared_ptr<platform::WorkQueue> serverQueue_;
  QueueProgress& progress_;
};

}  // namespace tarn::linux_host
