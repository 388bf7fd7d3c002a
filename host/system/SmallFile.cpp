#include "host/system/SmallFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>

#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

SmallFile readSmallFile(const std::string& path, std::size_t limit) {
  // A pipe of this name must not hold us up.
  const UniqueDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!file) {
    return {{}, errno};
  }
  return readSmallFile(file.get(), limit);
}

SmallFile readSmallFile(int descriptor, std::size_t limit) {
  struct stat facts {};
  if (::fstat(descriptor, &facts) != 0) {
    return {{}, errno};
  }
  if (!S_ISREG(facts.st_mode)) {
    return {{}, S_ISDIR(facts.st_mode) ? EISDIR : ENODEV};
  }
  SmallFile file;
  std::array<char, 16384> buffer;
  while (true) {
    const ssize_t count = ::pread(descriptor, buffer.data(), buffer.size(), static_cast<off_t>(file.content.size()));
    if (count == 0) {
      return file;
    }
    if (count < 0) {
      if (errno == EINTR) {
        continue;
      }
      return {{}, errno};
    }
    file.content.append(buffer.data(), static_cast<std::size_t>(count));
    if (file.content.size() > limit) {
      file.error = EFBIG;
      return file;
    }
  }
}

}  // namespace tarn::linux_host
