// SPDX-License-Identifier: Apache-2.0
// TattleService: the prompt that offers the person at the device to file a bug report from a prepared draft. The
// service asks for that person's consent; nothing is filed without it.
//
// A draft that was taken may still come to nothing, and nobody is told of that.
//
// Threads: requests on the server queue; the completion on a thread of the service's own, at any time.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/UniqueFunction.h"
#include "plist/Result.h"

namespace tarn::platform {

// What a bug report would say. Texts are UTF-8 and are shown to people.
struct TattleDraft {
  // Where the report is filed: the part of the system that it is about, by name, version and the bug tracker's number.
  struct Component {
    std::string name;
    std::string version;
    std::int64_t identifier = 0;
  };
  // A line, then as much as there is to say.
  std::string title;
  std::string description;
  Component component;
  // Numbers of the bug tracker's: how often it happens, and what kind of bug it is.
  std::int32_t reproducibility = 0;
  std::int32_t classification = 0;
  // What is to be gathered for the report once the person agrees.
  std::vector<std::string> diagnosticExtensions;  // identifiers
};

// Owned by the platform, which may lack it. It disturbs a person, so workers keep time between two drafts.
class TattleService {
 public:
  // Called once, with what went wrong or with nothing: the draft was taken, which doesn't say that anything was filed.
  using Completion = UniqueFunction<void(const Status& error)>;

  virtual ~TattleService() = default;
  // Offers the draft and returns at once, on behalf of a process when its name is known, with the reason that the
  // person is shown.
  virtual void createDraft(const TattleDraft& draft, const std::optional<std::string>& processName,
                           std::string_view displayReason, Completion completion) = 0;
};

}  // namespace tarn::platform
