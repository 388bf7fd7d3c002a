// TarnReportingSessionTattleWorker: offers the person at an internal build to file a bug report when a Parley call
// hands the audio layer invalid spatial coordinates.
//
// A prompt interrupts a person, so it comes at most once in a session's run and at most once in a back-off period on
// the whole device: the time of the last one is kept in the defaults store, over restarts. Messages of a session's
// first 5 seconds, by their own time stamps, are ignored: coordinates settle while a call is set up.
//
// It applies where the build is internal, the device has a prompt service and the back-off is set.
#pragma once

#include <memory>
#include <string_view>

#include "platform/TattleService.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingSessionTattleWorker : public TarnReportingSessionWorkerProtocol,
                                         public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionTattleWorker";

  static std::unique_ptr<TarnReportingSessionTattleWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool handleSingleMessageSession() { return true; }
  // `backOffTime`: seconds between two prompts on the device.
  TarnReportingSessionTattleWorker(std::weak_ptr<TarnReportingSession> session, double backOffTime);

  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;
  // The next run of the session may prompt again.
  void stop();

  // Whether the message asks for a prompt. A yes has claimed the back-off period already.
  bool interestedInMessage(const TarnReportingSessionMessage& message);
  // Whether the last run, kept under `defaultsKey`, is less than so many seconds ago. If not, now is stored as the
  // last.
  static bool hasRunInTimeframe(double backOffSeconds, std::string_view defaultsKey);
  static platform::TattleDraft docketDraftForParleyXYerror();

  double backOffTime() const noexcept { return backOffTime_; }
  bool hasRun() const noexcept { return hasRun_; }
  double minimumMessageTime() const noexcept { return minimumMessageTime_; }

 private:
  const double backOffTime_;
  bool hasRun_ = false;             // whether this run of the session has prompted
  double minimumMessageTime_ = -1;  // epoch seconds; not above 0 until the first message sets it
};

}  // namespace tarn
