// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionAudioRegistrationWorker: reports about once a week which wireless earbuds were connected lately,
// a record for each accessory, to the real-time-communication reporting service.
//
// A message that names the earbuds among the active devices makes it enumerate the accessories, at most once a minute.
// At stop it decides whether a publication is due. The first one of a device is put off by a random part of a week, so
// that many devices spread theirs.
//
// Switched off: initWithSession yields no worker. Whoever switches it on makes one with the public constructor.
//
// Owner: the session. Threads: the server queue; the back-end's completion comes on a thread of its own, at any time.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingRegistrationPublication;
class TarnReportingRegistrationState;

// Its class is in the table, so that switching it on takes one place.
class TarnReportingSessionAudioRegistrationWorker : public TarnReportingSessionWorkerProtocol,
                                                    public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionAudioRegistrationWorker";

  // Nothing, for every session.
  static std::unique_ptr<TarnReportingSessionAudioRegistrationWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  // The state is the process's shared() but in tests.
  TarnReportingSessionAudioRegistrationWorker(std::weak_ptr<TarnReportingSession> session,
                                              std::shared_ptr<TarnReportingRegistrationState> state);
  ~TarnReportingSessionAudioRegistrationWorker() override;

  // True.
  bool start();
  // Without an enumeration that found accessories nothing happens. When no moment was ever set, one within the next
  // week is drawn and stored. When it has passed, it is put off by a day first, so that a failure isn't repeated at
  // each stop; then the accessories that were connected within the last eight days are published, which puts it off by
  // a week. Without any such accessory it is put off by a week too.
  void stop();
  // An enumeration that fails is tried again after a day, one that went well after a minute at the earliest.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;

  // Opens a back-end session of the registration's own and sends the records through it once a backend is found.
  // Nothing without the session, the service or a token of it; the last two are told with an error line.
  void setupRTCReporterInterface(std::vector<plist::Dictionary> records);
  // Whether the last publication found backends.
  bool rtcReportingSessionStarted() const noexcept;
  // The category as the back-end knows it: without the upper half, which tells groups of tests apart.
  static std::uint16_t retrieveRTCReportingCategoryFromCategory(AudioEventCategory category);

  // Their given names: NOLINTBEGIN(readability-identifier-naming)
  // Sends one message through the last publication's back-end session; without one nothing is sent.
  void _sendMessage(const TarnReportingSessionMessage& message);
  // The work week (1 to 53) of a moment in the device's time zone. The number counts as whole seconds since 1970 of 32
  // bits without a sign; larger ones wrap.
  static int _convertEpochToWorkWeek(const plist::ValueView& epoch);
  // NOLINTEND(readability-identifier-naming)

 private:
  // One enumeration, and when the next may be.
  void enumerate();
  // What a stop does when a publication is due; `now` in epoch seconds.
  void publish(double now);
  // With the work week in place of the moment.
  std::vector<plist::Dictionary> recentRecords(double now) const;

  const std::shared_ptr<TarnReportingRegistrationState> state_;
  // The last one; kept, since letting go of a back-end session ends it.
  std::shared_ptr<TarnReportingRegistrationPublication> publication_;
};

}  // namespace tarn
