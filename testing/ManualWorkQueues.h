// SPDX-License-Identifier: Apache-2.0
// ManualWorkQueues: serial queues that run when told, on the time of a ManualClock.
//
// All work of all queues runs on the thread that calls a run operation, in the order in which it was handed over. While
// a piece of work runs, the run operations may be called again from inside it: work of the queues that are busy further
// up stays where it is, work of the others runs. So a piece of work that waits for a back-end can let the back-end
// work.
//
// A piece of work runs for the session for which it was handed over, as on a machine (RecordingSessionRecords).
//
// The server queue (the user-interactive one) is the test's own: while no work runs, the thread that made the queues
// counts as running work of it, so a test calls what is bound to that queue directly.
//
// Threads: work may be handed over on any thread; the run operations are for one thread at a time.
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/WorkQueue.h"

namespace tarn::testing {

class ManualClock;

namespace detail {
class ManualSchedule;
}

class ManualWorkQueue final : public platform::SuspendableQueue {
 public:
  ManualWorkQueue(std::shared_ptr<detail::ManualSchedule> schedule, std::size_t identifier, std::string name,
                  platform::QualityOfService quality);

  // The interface.
  void async(platform::Work work) override;
  void asyncAfter(std::chrono::nanoseconds delay, platform::Work work) override;
  bool isCurrent() const noexcept override;
  std::size_t waiting() const noexcept override;
  void suspend(std::chrono::nanoseconds longest, platform::Work next) override;
  void resume() override;
  void help(std::chrono::nanoseconds longest) override;
  bool spend(std::size_t cost) override;
  void asyncNext(platform::Work rest) override;

  // Controls.
  // From now on a piece of work that spent so much is told to give way; what is left of it then runs after all that
  // waits. Without it no work gives way.
  void setTurn(std::size_t cost) noexcept { turn_ = cost; }
  // Runs the oldest piece of due work of this queue; whether there was one.
  bool runOne();
  // Runs due work of this queue until there is none; how many pieces ran.
  std::size_t runUntilIdle();

  // Observations.
  const std::string& name() const noexcept { return name_; }
  // What its work has spent in all.
  std::size_t spent() const noexcept { return spentInAll_; }
  platform::QualityOfService quality() const noexcept { return quality_; }
  // Pieces of work of this queue whose moment has not come; a suspension is one.
  std::size_t delayed() const;

 private:
  const std::shared_ptr<detail::ManualSchedule> schedule_;
  const std::size_t identifier_;
  const std::string name_;
  const platform::QualityOfService quality_;
  std::size_t turn_ = 0;
  std::size_t spent_ = 0;  // since work of it last gave way
  std::size_t spentInAll_ = 0;
};

class ManualWorkQueues final : public platform::WorkQueues {
 public:
  // More pieces than this in one run are taken for an endless loop, and the process is ended.
  static constexpr std::size_t kMostPiecesInOneRun = 50'000'000;

  // The clock outlives the queues.
  explicit ManualWorkQueues(ManualClock& clock);
  ~ManualWorkQueues() override;
  ManualWorkQueues(const ManualWorkQueues&) = delete;
  ManualWorkQueues& operator=(const ManualWorkQueues&) = delete;

  // The interface.
  std::shared_ptr<platform::WorkQueue> makeSerialQueue(std::string_view name,
                                                       platform::QualityOfService quality) override;
  std::shared_ptr<platform::SuspendableQueue> makeSuspendableQueue(std::string_view name,
                                                                   platform::QualityOfService quality) override;

  // Controls.
  // Runs the oldest piece of due work of all queues; whether there was one.
  bool runOne();
  // Runs due work until there is none, what the work itself hands over included; how many pieces ran.
  std::size_t runUntilIdle();
  // Moves the clock on by `duration`, from moment to moment, and runs all work at the moment when it is due. Work that
  // is due before the call runs first. How many pieces ran.
  std::size_t advance(std::chrono::nanoseconds duration);
  // Whether help() runs what waits on its queue; else every thread of the pool was quicker.
  void setHelps(bool helps);
  // Destroys all work uncalled, delayed work included.
  void dropAll();

  // Observations.
  // The first queue made with this name that still lives; null when there is none.
  std::shared_ptr<ManualWorkQueue> find(std::string_view name) const;
  // The names of all queues that were made, in order.
  std::vector<std::string> names() const;
  // Pieces of due work of all queues, and pieces whose moment has not come.
  std::size_t waiting() const;
  std::size_t delayed() const;

 private:
  struct Made {
    std::string name;
    std::weak_ptr<ManualWorkQueue> queue;
  };

  std::shared_ptr<ManualWorkQueue> make(std::string_view name, platform::QualityOfService quality);

  const std::shared_ptr<detail::ManualSchedule> schedule_;
  std::vector<Made> made_;
};

}  // namespace tarn::testing
