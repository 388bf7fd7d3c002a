// SPDX-License-Identifier: Apache-2.0
// The table of worker classes. Its order is the order in which a session makes its workers and, within consumers,
// producers and the rest, starts and stops them.
//
// The order counts: the summary worker tells how many messages there were when its turn to stop has come, so what the
// producers above it derive is in its count and what those below it derive isn't. A new worker class gets its row in
// the source; docs/adding-a-worker.md tells the rest.
#pragma once

#include <span>

#include "session/TarnReportingSessionWorkerClass.h"

namespace tarn {

// All of them, in order. The table is static. Threads: any. One row a class, and no name twice, which the compiler
// checks. The entry point gives them to the sessions before the service is made; fixtures may give others.
std::span<const TarnReportingSessionWorkerClass> TarnReportingWorkerClasses();

}  // namespace tarn
