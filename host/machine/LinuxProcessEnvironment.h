// SPDX-License-Identifier: Apache-2.0
// LinuxProcessEnvironment: this process's environment variables, which processes that it starts inherit. Keeps nothing
// itself. Threads: see the interface.
#pragma once

#include "platform/ProcessEnvironment.h"

namespace tarn::linux_host {

class LinuxProcessEnvironment final : public platform::ProcessEnvironment {
 public:
  // EINVAL for a name that is empty or holds "=", ENOMEM. A NUL ends name and value.
  Status set(std::string_view name, std::string_view value) override;
};

}  // namespace tarn::linux_host
