// SPDX-License-Identifier: Apache-2.0
// RecorderRtcReportingService: the real-time-communication reporting service as the recorder stands in for it. Making a
// session, each message and each flush are recorded under back-end "rtc" with the session's number, which counts from
// 1 in each run.
//
// How it answers is told by the configuration: which backends a start finds, how late it says so, and whether it hands
// out tokens at all. Without a delay a completion comes within the call of the start. Late ones come on a queue of
// their own (see LateReplies), each at its moment.
//
// Owner: the platform; sessions may outlive it, but not the recorder. Threads: any.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/Clock.h"
#include "platform/RtcReportingService.h"
#include "platform/WorkQueue.h"

namespace tarn::recorder {

class Recorder;

class RecorderRtcReportingService final : public platform::RtcReportingService {
 public:
  // How it answers, as tests and trials want it; the defaults are a back-end that is well.
  struct Behaviour {
    bool available = true;                          // false: no token is handed out
    std::vector<std::string> backends{"recorder"};  // what a start's completion reports
    bool noBackends = false;                        // it reports no list at all
    std::chrono::milliseconds startDelay{0};        // how late it comes
    bool operator==(const Behaviour&) const = default;
  };

  // The recorder and the clock outlive this and its sessions, the work queues this.
  RecorderRtcReportingService(Recorder& recorder, const platform::Clock& clock, platform::WorkQueues& workQueues,
                              const Behaviour& behaviour);
  RecorderRtcReportingService(const RecorderRtcReportingService&) = delete;
  RecorderRtcReportingService& operator=(const RecorderRtcReportingService&) = delete;
  // Completions that have not come by then never come; one that runs is waited for.
  ~RecorderRtcReportingService() override;

  // Answers so from now on, but for the delay, which stays; starts whose completion is late are answered as they were
  // made. Threads: any.
  void setBehaviour(const Behaviour& behaviour);

  // "rtc-token-N", N counting from 1 in each run; nothing when the configuration hands out none. The parent isn't
  // looked at.
  std::optional<std::string> newHierarchyToken(const std::optional<std::string>& parentToken) override;
  // Never null; recorded even if it is never started. The frameworks aren't looked at. Up to 65536 completions may be
  // late at once; further ones come within the call.
  std::shared_ptr<platform::RtcReportingSession> createSession(
      const plist::Dictionary& sessionInfo, const plist::Dictionary& userInfo,
      const std::optional<std::vector<std::string>>& frameworksToCheck) override;

 private:
  // The completions of starts; a session's calls, each recorded as it is made.
  class Completions;
  class Session;

  Recorder& recorder_;
  const platform::Clock& clock_;
  // Of the configuration.
  std::atomic<bool> available_;
  // Sessions hold it weakly: after the service's end a start is answered by nobody.
  const std::shared_ptr<Completions> completions_;
  // Numbers given so far.
  std::atomic<std::uint64_t> tokens_{0};
  std::atomic<std::int64_t> sessions_{0};
};

}  // namespace tarn::recorder
