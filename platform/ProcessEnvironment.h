// ProcessEnvironment: the environment variables of this process, for libraries that are told things by them.
//
// Threads: any, but a library that reads the environment at the same time may see either value; set variables before
// the library is loaded.
#pragma once

#include <string_view>

#include "plist/Result.h"

namespace tarn::platform {

class ProcessEnvironment {
 public:
  virtual ~ProcessEnvironment() = default;
  // Sets the variable, replacing a value that it has.
  [[nodiscard]] virtual Status set(std::string_view name, std::string_view value) = 0;
};

}  // namespace tarn::platform
