// SPDX-License-Identifier: Apache-2.0
// RecorderSnareService: the bug-capture service as the recorder stands in for it. Requests and cancels are recorded
// under back-end "snare" when they are made; the replies come on a queue of the service's own.
//
// Each request is answered with a fresh session identifier, or, when the configuration wants refusals, with no success
// and that reason. A request that is answered with a refusal was taken all the same, so it is recorded like any other.
// One that can't be answered, because too many wait for their reply, is not accepted: not recorded, and its handler is
// dropped.
//
// Owner: the platform. Threads: requests on any; handlers on the service's queue (see LateReplies). The destructor
// waits for the handler that runs and drops the replies that wait. Reporters may outlive the service: then they accept
// nothing and record nothing.
#pragma once

#include <cstddef>
#include <memory>
#include <optional>

#include "platform/Clock.h"
#include "platform/RandomSource.h"
#include "platform/SnareService.h"
#include "platform/WorkQueue.h"

namespace tarn::recorder {

class Recorder;

class RecorderSnareService : public platform::SnareService {
 public:
  // Replies that may wait at once. They wait for a few log lines each, so this is far more than there ever are.
  static constexpr std::size_t kMostWaitingReplies = 1024;

  // `refuse`: the reason with which all requests are refused, nothing for none. The others outlive this. No queue is
  // made before the first request.
  RecorderSnareService(Recorder& recorder, const platform::Clock& clock, platform::RandomSource& randomSource,
                       platform::WorkQueues& workQueues, std::optional<platform::SnareReason> refuse);
  ~RecorderSnareService() override;
  RecorderSnareService(const RecorderSnareService&) = delete;
  RecorderSnareService& operator=(const RecorderSnareService&) = delete;

  // Refuses with this reason from now on, or no more: replies that wait are given so too. Threads: any.
  void setRefusal(std::optional<platform::SnareReason> refuse) noexcept;

  // A new one, never null. All of them share the service's line of replies.
  std::shared_ptr<platform::SnareReporter> createReporter() override;

 private:
  // Takes and answers requests, for the service and for reporters that outlive it.
  class Intake;
  class Reporter;

  // Shared with the reporters, closed at the end of this.
  const std::shared_ptr<Intake> intake_;
};

}  // namespace tarn::recorder
