// The folders and files that keep the host's state. Threads: any. Nothing is thrown.
#pragma once

#include <chrono>
#include <string>
#include <string_view>

#include "host/system/FileLock.h"
#include "host/system/Files.h"

namespace tarn::linux_host {

// Whether the name is a plain one that can stand for a file of its own: not empty, no slash or NUL, no leading dot
// (such files are the host's own), at most 200 bytes.
bool isPlainName(std::string_view name) noexcept;

// Makes a folder, and those above it, with this mode; 0 when it is there now, or an errno value.
int makeFolder(const std::string& path, unsigned mode);

// Makes the state directory (mode 0750) and checks that it can be used; empty, or what is wrong, with the path.
std::string prepareStateDirectory(const std::string& path);

// Keeps the state directory for one service until the lock's end: two recorders on one file would each take the other's
// for damaged. One that is just ending is waited for. Empty, or what is wrong, with the path.
std::string holdStateDirectory(const std::string& path, FileLock& lock,
                               std::chrono::milliseconds patience = std::chrono::seconds(3));

}  // namespace tarn::linux_host
