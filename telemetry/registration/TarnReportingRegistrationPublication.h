// SPDX-License-Identifier: Apache-2.0
// TarnReportingRegistrationPublication: a back-end session of the registration's own, and the records that are sent
// through it once a backend is found.
//
// Owner: the worker that began it, and the back-end's completion while that is awaited; so the records are sent even
// when the worker has gone. Threads: begin() on the server queue, the completion on the back-end's thread.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingVocabulary.h"

namespace tarn {

namespace platform {
class RtcReportingSession;
}
class TarnReportingRegistrationState;
class TarnReportingSession;
class TarnReportingSessionMessage;

// For one publication. The back-end's session ends when this goes.
class TarnReportingRegistrationPublication : public std::enable_shared_from_this<TarnReportingRegistrationPublication> {
 public:
  // `records`: a message of the category Tessels and the type Summary each.
  TarnReportingRegistrationPublication(std::shared_ptr<TarnReportingRegistrationState> state,
                                       std::vector<plist::Dictionary> records);
  ~TarnReportingRegistrationPublication();
  TarnReportingRegistrationPublication(const TarnReportingRegistrationPublication&) = delete;
  TarnReportingRegistrationPublication& operator=(const TarnReportingRegistrationPublication&) = delete;

  // Opens the back-end session under the token and has it look for backends. Nothing comes of it when there is no
  // session to be had. Once. The session is looked at only during the call. When no backend is found an error line
  // tells so, and the next publication stays where it was put.
  void begin(const TarnReportingSession& session, const std::string& hierarchyToken);
  // Whether backends were found.
  bool started() const noexcept { return started_; }
  // Sends one message as it is. One that is refused with an error is logged; one that is sent puts the next publication
  // off by a week. After begin(); without a back-end session nothing is sent.
  void _sendMessage(
      const TarnReportingSessionMessage& message);  // NOLINT(readability-identifier-naming): its given name
  // The category proper, without its domain.
  static std::uint16_t retrieveRTCReportingCategoryFromCategory(AudioEventCategory category) {
    return static_cast<std::uint16_t>(category);
  }

 private:
  // In their order, on the back-end's thread.
  void sendRecords();

  const std::shared_ptr<TarnReportingRegistrationState> state_;
  const std::vector<plist::Dictionary> records_;
  std::shared_ptr<platform::RtcReportingSession> rtcReportingSession_;  // set before the completion can come
  std::atomic<bool> started_{false};
};

}  // namespace tarn
