// folderNames: the names in a folder, bounded. Threads: any. Nothing is thrown.
#pragma once

#include <cstddef>
#include <functional>
#include <set>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::linux_host {

struct FolderNames {
  std::set<std::string> names;
  bool complete = true;  // false: there are more
};

// The first names in their order, at most `limit`, of those that are wanted. A folder with very many entries is not
// looked at to its end. Beside an error stands what was found before it.
Result<FolderNames> folderNames(const std::string& folder, std::size_t limit,
                                const std::function<bool(std::string_view)>& isWanted);

}  // namespace tarn::linux_host
