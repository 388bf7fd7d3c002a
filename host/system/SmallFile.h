// readSmallFile: the content of a file that is expected to be small. Threads: any. Nothing is thrown.
#pragma once

#include <cstddef>
#include <string>

namespace tarn::linux_host {

struct SmallFile {
  std::string content;
  int error = 0;  // 0, an errno value, or EFBIG when there is more than the limit (the content is the beginning)
};

// Reads at most `limit` bytes. Only a regular file is read (ENODEV for another, which might never end); the kernel's
// files under /proc and /sys are such.
SmallFile readSmallFile(const std::string& path, std::size_t limit);
// The same of a file that is open already, from its beginning.
SmallFile readSmallFile(int descriptor, std::size_t limit);

}  // namespace tarn::linux_host
