// SPDX-License-Identifier: Apache-2.0
// Small looks at the file system that several checks take. Threads: any.
#pragma once

#include <sys/stat.h>

#include <string>

namespace tarn::linux_host {

// The folder that a path lies in: "." where it names none.
std::string folderOf(const std::string& path);
// The path itself, or the nearest folder above it that is there.
std::string nearestOf(std::string path);
// "0750"
std::string modeText(mode_t mode);
// The user's name, or the number where it has none.
std::string userText(uid_t user);
// Who holds a lock on the file as services take them (flock); 0 for nobody. The lock isn't tried, as a service that
// starts just then would be refused it: the kernel's list is read.
pid_t lockHolder(const std::string& path);

}  // namespace tarn::linux_host
