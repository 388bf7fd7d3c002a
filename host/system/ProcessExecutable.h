// SPDX-License-Identifier: Apache-2.0
// What program a process runs, for log lines that must name a peer and for the paths of this one.
//
// Threads: any. Asks /proc, so it costs a few system calls and never waits for the process.
#pragma once

#include <cstdint>
#include <string>

namespace tarn::linux_host {

// Its path, by the kernel's word, with " (deleted)" after it when the file was replaced since; of a process of another
// user its short name in brackets, as the path isn't told then; "an unknown program" when the process is gone. A number
// that another process has by now names that one: who asks late may be told wrong, so it serves people and decides
// nothing.
std::string executableOf(std::int32_t process);

}  // namespace tarn::linux_host
