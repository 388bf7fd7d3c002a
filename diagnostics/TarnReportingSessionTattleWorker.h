// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionTattleWorker: offers the person at an internal build to file a bug report when a Parley call
// hands the audio layer invalid spatial coordinates.
//
// A prompt interrupts a person, so it comes at most once in a session's run and at most once in a back-off period on
// the whole device: the time of the last one is kept in the defaults store, over restarts. Messages of a session's
// first 5 seconds, by their own time stamps, are ignored: coordinates settle while a call is set up.
//
// It applies where the build is internal, the device has a prompt service and the back-off is set.
//
// Owner: the session. Threads: the server queue; the prompt's outcome is logged on a thread of its service, whenever it
// comes.
#pragma once

#include <memory>
#include <string_view>

#include "platform/TattleService.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// Redundant messages don't come here, so an error that is repeated at once counts once.
class TarnReportingSessionTattleWorker : public TarnReportingSessionWorkerProtocol,
                                         public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionTattleWorker";

  // The back-off is the default "ParleyInvalidXyBackOffSeconds"; a line at debug level tells when it isn't set.
  static std::unique_ptr<TarnReportingSessionTattleWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  // Errors of an application that reports without a session count too.
  static bool handleSingleMessageSession() { return true; }
  // `backOffTime`: seconds between two prompts on the device.
  TarnReportingSessionTattleWorker(std::weak_ptr<TarnReportingSession> session, double backOffTime);

  // Asks the prompt service for a draft, with the client's name when it is known. When this run has prompted already it
  // does nothing more, though the message has claimed a back-off period.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;
  // The next run of the session may prompt again.
  void stop();

  // Whether the message asks for a prompt. A yes has claimed the back-off period already. The first message only sets
  // the time from which on others count, 5 seconds after its own; what carries no later time is ignored. The tests go
  // from cheap to dear: the time, the keys, the defaults store.
  bool interestedInMessage(const TarnReportingSessionMessage& message);
  // Whether the last run, kept under `defaultsKey`, is less than so many seconds ago. If not, now is stored as the
  // last. By the wall clock, which alone outlives a restart. When the time can't be stored, the answer is no all the
  // same: one prompt in a session's run is the most that can come of that.
  static bool hasRunInTimeframe(double backOffSeconds, std::string_view defaultsKey);
  // The bug report as it is offered: texts, component, and which diagnostics are to be gathered. Always the same.
  static platform::TattleDraft docketDraftForParleyXYerror();

  // As it was set when the worker was made: a later change of the default is for later sessions.
  double backOffTime() const noexcept { return backOffTime_; }
  bool hasRun() const noexcept { return hasRun_; }
  // Epoch seconds by which a message must be later to count; -1 until one has come. A stop keeps it.
  double minimumMessageTime() const noexcept { return minimumMessageTime_; }

 private:
  const double backOffTime_;
  bool hasRun_ = false;             // whether this run of the session has prompted
  double minimumMessageTime_ = -1;  // epoch seconds; not above 0 until the first message sets it
};

}  // namespace tarn
