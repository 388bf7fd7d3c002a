// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionSnareWorker: watches a session's messages for known audio faults and, once one has been seen
// often enough, has the device's bug-capture service capture diagnostics. On internal builds only.
//
// The faults are the business of its instances; the worker feeds them every message, redundant ones included, counts
// what interests them and keeps the trigger rule. In sessions of the service type Test it counts, but never fires.
//
// A message that interests nobody, which is nearly every one, costs a few comparisons of numbers: it is neither
// compared with an earlier one nor copied.
//
// Owner: the session. Threads: the server queue; the capture service replies on a thread of its own.
#pragma once

#include <memory>
#include <string_view>
#include <vector>

#include "diagnostics/snare/TarnReportingSnareOperations.h"
#include "diagnostics/snare/TarnReportingSnareWorkerInstance.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// The operations of TarnReportingSnareOperations are its class operations, too.
class TarnReportingSessionSnareWorker : public TarnReportingSessionWorkerProtocol,
                                        public TarnReportingSessionWorkerConsumerProtocol,
                                        public TarnReportingSnareOperations {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionSnareWorker";
  using InstanceClass = TarnReportingSnareWorkerInstanceClass;

  // An instance with what its class can do.
  struct Member {
    InstanceClass instanceClass;
    std::unique_ptr<TarnReportingSnareWorkerInstance> instance;
  };

  // For every session of an internal build whose device has the capture service; with the instances that apply. In this
  // order: haptics that were left running (where the device has haptics), alarms at too low a level, late recording
  // queues, stuck system sounds.
  static std::unique_ptr<TarnReportingSessionSnareWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool handleSingleMessageSession() { return true; }
  // Without instances.
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Adds an instance of the class after the others, unless the class or this session declines.
  void addInstance(const InstanceClass& instanceClass);
  // In the order in which they were added.
  const std::vector<Member>& instances() const noexcept { return instances_; }

  // Starts the instances that want to know; true.
  bool start();
  // Whether a message repeats another one is decided here for each kind of fault, with other rules than the session's.
  bool handleRedundantMessages() { return true; }
  // An instance that is interested in a message, unless that repeats its last one word by word, counts it, is told of
  // it, and fires when the rule of its state says so; then it counts anew.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;
  // Stops the instances that want to know. Counts that the process keeps go on.
  void stop();

 private:
  // What one message of interest causes.
  void handleInterest(const Member& member, const TarnReportingSessionMessage& message);
  // A fire of a test session is counted like any other but asks the service for nothing.
  void fire(const Member& member, const TarnReportingSession& session, const TarnReportingSessionMessage& message);

  std::vector<Member> instances_;
};

}  // namespace tarn
