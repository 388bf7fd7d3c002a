// The directory that keeps the service's state, made and held for one service. Threads: any. Nothing is thrown.
#pragma once

#include <chrono>
#include <string>

#include "host/system/FileLock.h"
#include "plist/Result.h"

namespace tarn::linux_host {

// Makes the state directory (mode 0750) and checks that it can be used. An error names the path.
Status prepareStateDirectory(const std::string& path);

// Keeps the state directory for one service until the lock's end: two recorders on one file would each take the other's
// for damaged. One that is just ending is waited for. An error names the path.
Status holdStateDirectory(const std::string& path, FileLock& lock,
                          std::chrono::milliseconds patience = std::chrono::seconds(3));

}  // namespace tarn::linux_host
