// readSmallFile: the content of a file that is expected to be small. Threads: any. Nothing is thrown.
#pragma once

#include <cstddef>
#include <string>

#include "plist/Result.h"

namespace tarn::linux_host {

// Reads the whole content. When there is more than `limit` bytes the error is EFBIG, beside the beginning of it. Only a
// regular file is read (ENODEV for another, which might never end); the kernel's files under /proc and /sys are such.
Result<std::string> readSmallFile(const std::string& path, std::size_t limit);
// The same of a file that is open already, from its beginning.
Result<std::string> readSmallFile(int descriptor, std::size_t limit);

}  // namespace tarn::linux_host
