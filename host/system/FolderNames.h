// SPDX-License-Identifier: Apache-2.0
// folderNames: the names in a folder, bounded both in memory and in time: folders here are written by other programs,
// and one with a million entries must not hold up who looks into it.
//
// Threads: any; it blocks on the disk. Nothing is thrown but for want of memory.
#pragma once

#include <cstddef>
#include <functional>
#include <set>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::linux_host {

struct FolderNames {
  // Sorted by bytes, so that what a bound cuts off is the same each time.
  std::set<std::string> names;
  bool complete = true;  // false: there are more
};

// The first names in their order, at most `limit`, of those that are wanted. A folder with more than 16384 entries is
// not looked at to its end; which of them were seen is the file system's choice then. Beside an error (of opening or
// reading the folder) stands what was found before it. "." and ".." are names too: `isWanted` refuses them. It is asked
// once for each entry and sees a text that lives for that call.
Result<FolderNames> folderNames(const std::string& folder, std::size_t limit,
                                const std::function<bool(std::string_view)>& isWanted);

}  // namespace tarn::linux_host
