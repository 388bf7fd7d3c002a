// SPDX-License-Identifier: Apache-2.0
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

// A worker is made at most once and stays until the session ends; stops and starts go on with the same one. A class
// that declined is asked again at the next start, since the session's type or the device's settings may be others then.
// In between, everything that happens is told at debug level.
class TarnReportingSessionWorkerSet {
 public:
  using Class = TarnReportingSessionWorkerClass;
  using Worker = TarnReportingSessionWorkerProtocol;

  // A worker with its class, and the way to hand it messages.
  struct Member {
    const Class* workerClass;
    std::unique_ptr<Worker> worker;
    TarnReportingSessionWorkerConsumerProtocol* consumer;  // null: no consumer
  };

  TarnReportingSessionWorkerSet() = default;
  TarnReportingSessionWorkerSet(const TarnReportingSessionWorkerSet&) = delete;
  TarnReportingSessionWorkerSet& operator=(const TarnReportingSessionWorkerSet&) = delete;

  // Makes the workers of these classes that apply to the session and aren't there yet, in this order, then starts every
  // worker of the set that doesn't run: consumers, then producers, then the rest. In a single-message session only
  // classes are asked that say they may run there. A worker whose start() says no stays, gets no message, and is
  // offered a start again the next time; one without start() runs at once.
  void startWorkersFromClasses(const TarnReportingSessionWorkerClasses::List& classes,
                               const std::shared_ptr<TarnReportingSession>& session);
  // Stops every worker that runs: producers first, so that what they derive still reaches running consumers. Then
  // consumers, then the rest, each in the order of creation; a worker of both kinds takes the producers' turn. A worker
  // is told to stop while it still counts as running, so what it sends may come back to it.
  void stopWorkers(std::int64_t reporterID);
  // Hands the message to each running consumer that wants it, in order; how many did. A consumer gets a redundant
  // message only when it declares handleRedundantMessages() and that is true, and an addressed one only when its class
  // is among the destinations. The order is that of creation. May be called again from within, for messages that a
  // worker sends meanwhile.
  std::size_t deliver(const std::shared_ptr<TarnReportingSessionMessage>& message, std::int64_t reporterID) const;

  // Lets go of them without stopping them.
  void release() noexcept { messageWorkers_.clear(); }

  // Every worker, in the order of creation.
  const std::vector<Member>& messageWorkers() const noexcept { return messageWorkers_; }

 private:
  // One class of a start: skipped, declined or added.
  void makeWorker(const Class& workerClass, const std::shared_ptr<TarnReportingSession>& session);
  void startWorkers(std::int64_t reporterID);
  // Whether there is a worker of this class.
  bool holds(const Class& workerClass) const noexcept;

  std::vector<Member> messageWorkers_;
};

}  // namespace tarn
