// SPDX-License-Identifier: Apache-2.0
// ScriptStep: one line of a script, checked.
#pragma once

#include <cstddef>
#include <string>

#include "wire/Request.h"

namespace tarn::script {

// Plain data. What doesn't belong to the kind is as it was made.
struct ScriptStep {
  enum class Kind {
    Request,     // a remote operation
    Sleep,       // wait so many seconds
    Disconnect,  // close the client's connection
  };

  // The line's number, from 1, for replies and complaints.
  std::size_t line = 0;
  Kind kind = Kind::Request;
  // The two texts come back in the line that a reply is printed as.
  std::string op;      // the operation as the script names it
  std::string client;  // names the connection
  // With the arguments that the operation has, within their ranges.
  wire::Request request;
  // From 0 to a year, of a sleep.
  double seconds = 0;
};

// The connection of a line that names none.
inline constexpr const char* kDefaultClient = "main";

}  // namespace tarn::script
