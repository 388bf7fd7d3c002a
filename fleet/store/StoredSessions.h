// SPDX-License-Identifier: Apache-2.0
// StoredSessions: what a store tells of a session beside its events: its row, its run and its periods, for whoever
// makes batches of them. An interface, so that tests need no file.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/reading/SessionReader.h"

namespace tarn::fleet {

struct StoredSession {
  recorder::SessionRow session;
  recorder::RunRow run;
  std::vector<recorder::PeriodRow> periods;
};

class StoredSessions {
 public:
  virtual ~StoredSessions() = default;
  // Nothing without an error when there is no such session, or not its run. It is there until the next call.
  virtual Result<std::optional<StoredSession>> find(std::int64_t id) = 0;
};

}  // namespace tarn::fleet
