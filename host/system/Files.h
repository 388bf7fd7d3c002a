// What the system's calls on files leave to do by hand. Threads: any. Nothing is thrown.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::linux_host {

// Writes all of it, however many pieces the system takes it in. After an error some of it may be written.
[[nodiscard]] Status writeAll(int descriptor, std::string_view bytes);

// Makes the directory and what is missing above it, each with this mode less the process's mask. One that is there
// already is left as it is, and that is a success.
[[nodiscard]] Status createDirectories(const std::string& path, mode_t mode);

// When root works on the state of a service that runs as another user, a file that root made new goes to the owner of
// the folder that it lies in, or the service couldn't read it. For others nothing happens.
void giveToFolderOwner(int descriptor, const std::string& folder) noexcept;

}  // namespace tarn::linux_host
