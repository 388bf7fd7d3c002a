// SPDX-License-Identifier: Apache-2.0
// RecorderTattleService: the bug-filing prompt as the recorder stands in for it: drafts are recorded under back-end
// "tattle", with the text that people would have been shown and the process that it is about, where one is known. There
// is nobody to ask, so every draft counts as taken.
//
// Owner: the platform. Threads: requests on the server queue; completions on a queue of its own (see LateReplies), or
// within the call of a request that comes while too many wait.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/Clock.h"
#include "platform/TattleService.h"
#include "platform/WorkQueue.h"
#include "recorder/LateReplies.h"

namespace tarn::recorder {

class Recorder;

class RecorderTattleService : public platform::TattleService {
 public:
  // All outlive this. At its end completions that wait come all the same, on their queue.
  RecorderTattleService(Recorder& recorder, const platform::Clock& clock, platform::WorkQueues& workQueues)
      : recorder_(recorder), clock_(clock), completions_(workQueues, {"sys.oxbow.tarnkit.recorder.tattle"}) {}

  // Recorded at once; the completion comes later and says that the draft was taken. No more than 1024 may wait.
  void createDraft(const platform::TattleDraft& draft, const std::optional<std::string>& processName,
                   std::string_view displayReason, Completion completion) override;

 private:
  Recorder& recorder_;
  const platform::Clock& clock_;
  // One after the other, in the order of the requests.
  LateReplies completions_;
};

}  // namespace tarn::recorder
