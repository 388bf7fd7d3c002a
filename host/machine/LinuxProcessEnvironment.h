// LinuxProcessEnvironment: this process's environment variables. Threads: see the interface.
#pragma once

#include "platform/ProcessEnvironment.h"

namespace tarn::linux_host {

class LinuxProcessEnvironment final : public platform::ProcessEnvironment {
 public:
  Status set(std::string_view name, std::string_view value) override;
};

}  // namespace tarn::linux_host
