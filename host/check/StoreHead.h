// SPDX-License-Identifier: Apache-2.0
// layoutVersionOf: which layout the recorder's file has, without SQLite, which would make files beside it to look.
//
//   database: "SQLite format 3\0" ... [60: user_version] ...      all numbers big-endian
//   its log:  [8: page size] ... [16: salts] then frames of [page][size after a commit][salts][checksums] and a page
//
// Page 1 begins with the database's head, so the newest page 1 that was committed to the log counts. Threads: any.
#pragma once

#include <cstdint>
#include <string>

#include "plist/Result.h"

namespace tarn::linux_host {

// `PRAGMA user_version` as a reader would see it. An error where it is no database or can't be read, with its path.
Result<std::int64_t> layoutVersionOf(const std::string& path);

}  // namespace tarn::linux_host
