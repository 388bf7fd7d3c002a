// TattleService: the prompt that offers the person at the device to file a bug report from a prepared draft. The
// service asks for that person's consent; nothing is filed without it.
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

struct TattleDraft {
  struct Component {
    std::string name;
    std::string version;
    std::int64_t identifier = 0;
  };
  std::string title;
  std::string description;
  Component component;
  std::int32_t reproducibility = 0;
  std::int32_t classification = 0;
  std::vector<std::string> diagnosticExtensions;  // identifiers
};

class TattleService {
 public:
  // Called once, with what went wrong or with nothing.
  using Completion = UniqueFunction<void(const Status& error)>;

  virtual ~TattleService() = default;
  // Offers the draft, on behalf of a process when its name is known, with the reason that the person is shown.
  virtual void createDraft(const TattleDraft& draft, const std::optional<std::string>& processName,
                           std::string_view displayReason, Completion completion) = 0;
};

}  // namespace tarn::platform
