// SPDX-License-Identifier: Apache-2.0
#include "host/system/SmallFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <utility>

#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

Result<std::string> readSmallFile(const std::string& path, std::size_t limit) {
  // A pipe of this name must not hold us up.
  const UniqueDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!file) return {{}, lastSystemError()};
  return readSmallFile(file.get(), limit);
}

Result<std::string> readSmallFile(int descriptor, std::size_t limit) {
  struct stat facts {};
  if (::fstat(descriptor, &facts) != 0) return {{}, lastSystemError()};
  if (!S_ISREG(facts.st_mode)) return {{}, systemError(S_ISDIR(facts.st_mode) ? EISDIR : ENODEV)};
  std::string content;
  std::array<char, 16384> buffer;
  while (true) {
    const ssize_t count = ::pread(descriptor, buffer.data(), buffer.size(), static_cast<off_t>(content.size()));
    if (count == 0) return {std::move(content), {}};
    if (count < 0) {
      if (errno == EINTR) continue;
      return {{}, lastSystemError()};
    }
    content.append(buffer.data(), static_cast<std::size_t>(count));
    if (content.size() > limit) return {std::move(content), systemError(EFBIG)};
  }
}

}  // namespace tarn::linux_host
