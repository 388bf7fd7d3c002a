// What program a process runs. Threads: any.
#pragma once

#include <cstdint>
#include <string>

namespace tarn::linux_host {

// Its path, by the kernel's word; of a process of another user its short name in brackets, as the path isn't told then;
// "an unknown program" when the process is gone.
std::string executableOf(std::int32_t process);

}  // namespace tarn::linux_host
