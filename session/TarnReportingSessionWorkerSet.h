// TarnReportingSessionWorkerSet: the workers of one session; which are made, in which order they start and stop, and
// which of them get a message.
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "session/TarnReportingSessionWorkerClass.h"

namespace tarn {

class TarnReportingSessionWorkerSet {
 public:
  using Class = TarnReportingSessionWorkerClass;
  using Worker = TarnReportingSessionWorkerProtocol;

  struct Member {
    const Class* workerClass;
    std::unique_ptr<Worker> worker;
    TarnReportingSessionWorkerConsumerProtocol* consumer;  // null: no consumer
  };

  TarnReportingSessionWorkerSet() = default;
  TarnReportingSessionWorkerSet(const TarnReportingSessionWorkerSet&) = delete;
  TarnReportingSessionWorkerSet& operator=(const TarnReportingSessionWorkerSet&) = delete;

  // Makes the workers of these classes that apply to the session and aren't there yet, in this order, then starts every
  // worker of the set that doesn't run: consumers, then producers, then the rest.
  void startWorkersFromClasses(const TarnReportingSessionWorkerClasses::List& classes,
                               const std::shared_ptr<TarnReportingSession>& session);
  // Stops every worker that runs: producers first, so that what they derive still reaches running consumers.
  void stopWorkers(std::int64_t reporterID);
  // Hands the message to each running consumer that wants it, in order; how many did.
  std::size_t deliver(const std::shared_ptr<TarnReportingSessionMessage>& message, std::int64_t reporterID) const;

  // Every worker, in the order of creation.
  const std::vector<Member>& messageWorkers() const noexcept { return messageWorkers_; }

 private:
  void makeWorker(const Class& workerClass, const std::shared_ptr<TarnReportingSession>& session);
  void startWorkers(std::int64_t reporterID);
  bool holds(const Class& workerClass) const noexcept;

  std::vector<Member> messageWorkers_;
};

}  // namespace tarn
