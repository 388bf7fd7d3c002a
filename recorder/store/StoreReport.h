// SPDX-License-Identifier: Apache-2.0
// StoreReport: whether a recorder's file is whole, looked at from outside: read-only, beside a running service or
// without one. The same checks that the recorder itself makes, without its remedies: nothing is mended. Threads: any.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/SessionCheck.h"
#include "recorder/store/StoreCheck.h"

namespace tarn::recorder {

// What was found, as ids where there are any. With damage the rest is what could still be read.
struct StoreReport {
  // Events, by what became of them; ids in rising order.
  std::int64_t whole = 0;          // events that are as they were written
  std::vector<IdRange> lost;       // ids of events that are gone or aren't as they were written
  std::vector<IdRange> notedLost;  // likewise, and the recorder knows
  std::vector<IdRange> unproven;   // ids of events whose checksum is damaged
  DamagedRows damagedRows;         // beside the events
  std::string damage;              // of the pages, when there is any
  // Whether there is nothing to complain about.
  bool isWhole() const noexcept {
    return lost.empty() && notedLost.empty() && unproven.empty() && countOf(damagedRows) == 0 && damage.empty();
  }
};

// An error when the file isn't there, can't be read or isn't a recorder's. Reads all of it, which takes as long as
// that; the service isn't held up, but its log can't begin anew meanwhile. The database isn't changed.
Result<StoreReport> inspectStore(const std::filesystem::path& file);

}  // namespace tarn::recorder
