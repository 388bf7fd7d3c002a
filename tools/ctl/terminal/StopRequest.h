// SPDX-License-Identifier: Apache-2.0
// StopRequest: how a command that goes on for ever learns that its reader has enough: by a signal, or since nobody
// reads standard output any more. Neither is a failure.
//
// What a signal asked for is the process's own and is never taken back. Threads: one.
#pragma once

#include <chrono>

namespace tarn::ctl {

// From here on SIGINT and SIGTERM ask the command to end and do nothing else.
void stopOnSignals();
// Whether a signal asked for the end, or nobody reads standard output any more. A pipe whose reader left says so
// without anything being written.
bool isStopRequested();
// Waits so long; false once isStopRequested(), which is noticed within 200 ms.
bool pauseUnlessStopped(std::chrono::duration<double> pause);

}  // namespace tarn::ctl
