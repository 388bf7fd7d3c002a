// SPDX-License-Identifier: Apache-2.0
// FakeTattleService: a bug-filing prompt without a person: it keeps the drafts and completes as it is told.
//
// Threads: one at a time; completions as ReplyFaults delivers them.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/TattleService.h"
#include "testing/backends/OrderRecord.h"
#include "testing/backends/ReplyFaults.h"

namespace tarn::testing {

class FakeTattleService final : public platform::TattleService, public Recorded {
 public:
  struct Prompt {
    platform::TattleDraft draft;
    std::optional<std::string> processName;
    std::string displayReason;
  };

  // The interface.
  void createDraft(const platform::TattleDraft& draft, const std::optional<std::string>& processName,
                   std::string_view displayReason, Completion completion) override {
    happened("draft");
    prompts_.push_back({draft, processName, std::string(displayReason)});
    replies_.deliver([completion = std::move(completion), error = refusal_]() mutable { completion(error); });
  }

  // Controls.
  // Completions carry this error; nothing: they succeed.
  void refuseWith(Status error) { refusal_ = std::move(error); }
  ReplyFaults& replies() { return replies_; }

  // Observations.
  const std::vector<Prompt>& prompts() const noexcept { return prompts_; }

 private:
  Status refusal_;
  std::vector<Prompt> prompts_;
  ReplyFaults replies_;
};

}  // namespace tarn::testing
