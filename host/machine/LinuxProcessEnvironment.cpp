// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxProcessEnvironment.h"

#include <cstdlib>
#include <string>

#include "host/system/SystemError.h"

namespace tarn::linux_host {

Status LinuxProcessEnvironment::set(std::string_view name, std::string_view value) {
  if (::setenv(std::string(name).c_str(), std::string(value).c_str(), 1) == 0) return {};
  return lastSystemError();
}

}  // namespace tarn::linux_host
