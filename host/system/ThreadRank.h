// SPDX-License-Identifier: Apache-2.0
// Which of the process's threads has a processor first when there are too few.
//
// Threads: any; each call is about the calling thread.
#pragma once

namespace tarn::linux_host {

// For a thread whose work may wait for that of the thread that made it: it goes on when that one sleeps, or when there
// is a processor for both. Needs no permission. A thread that is at the lowest rank already stays there.
void standBack() noexcept;

}  // namespace tarn::linux_host
