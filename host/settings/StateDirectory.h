// SPDX-License-Identifier: Apache-2.0
// The directory that keeps the service's state, made and held for one service. Called at the start, in this order,
// before anything is opened in it. Threads: any. Nothing is thrown.
#pragma once

#include <chrono>
#include <string>

#include "host/system/FileLock.h"
#include "plist/Result.h"

namespace tarn::linux_host {

// Makes the state directory (mode 0750) with what is missing above it, and checks that it can be listed, entered and
// written by this process. An error reads "state directory PATH: why".
Status prepareStateDirectory(const std::string& path);

// Keeps the state directory for one service until the lock's end: two recorders on one file would each take the other's
// for damaged. One that is just ending is waited for, up to `patience`; then the error reads "another service uses the
// state directory PATH". A service that died holds nothing: the kernel gave its lock back.
Status holdStateDirectory(const std::string& path, FileLock& lock,
                          std::chrono::milliseconds patience = std::chrono::seconds(3));

}  // namespace tarn::linux_host
