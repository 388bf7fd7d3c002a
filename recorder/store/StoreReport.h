// StoreReport: whether a recorder's file is whole, looked at from outside: read-only, beside a running service or
// without one. Threads: any.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/StoreCheck.h"

namespace tarn::recorder {

struct StoreReport {
  std::int64_t whole = 0;          // events that are as they were written
  std::vector<IdRange> lost;       // ids of events that are gone or aren't as they were written
  std::vector<IdRange> notedLost;  // likewise, and the recorder knows
  std::vector<IdRange> unproven;   // ids of events whose checksum is damaged
  std::string damage;              // of the pages, when there is any
  bool isWhole() const noexcept { return lost.empty() && notedLost.empty() && unproven.empty() && damage.empty(); }
};

// An error when the file isn't there, can't be read or isn't a recorder's.
Result<StoreReport> inspectStore(const std::filesystem::path& file);

}  // namespace tarn::recorder
