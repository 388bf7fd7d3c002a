// SPDX-License-Identifier: Apache-2.0
// StartWithoutMemory: how the process ends when memory is missing before anybody can connect.
//
// Which problem: where nobody can catch it, as for the keys that are made before main(), std::terminate() would abort
// and tell of a signal. How: a handler that is there before all other static objects says one line and exits. Once the
// service serves, memory that is missing is a state, and the usual handler stands again. Threads: the starting one.
#pragma once

#include <exception>
#include <string>

namespace tarn::linux_host {

// From the start of the program until over() is called.
class StartWithoutMemory {
 public:
  StartWithoutMemory() noexcept;
  // What is missing, memory or threads, in a few words.
  static std::string textOf(const std::exception& shortage);
  // The service serves: whoever had the handler before gets it back.
  static void over() noexcept;

 private:
  [[noreturn]] static void end() noexcept;

  std::terminate_handler usual_;
};

}  // namespace tarn::linux_host
