// SPDX-License-Identifier: Apache-2.0
// ProcessEnvironment: the environment variables of this process, for libraries that are told things by them.
//
// Threads: any, but a library that reads the environment at the same time may see either value; set variables before
// the library is loaded.
#pragma once

#include <string_view>

#include "plist/Result.h"

namespace tarn::platform {

// Owned by the platform. Nothing is ever read here: what the environment tells us comes in as options.
class ProcessEnvironment {
 public:
  virtual ~ProcessEnvironment() = default;
  // Sets the variable, replacing a value that it has. Fails for a name that is empty or holds "=", and for want of
  // memory.
  [[nodiscard]] virtual Status set(std::string_view name, std::string_view value) = 0;
};

}  // namespace tarn::platform
