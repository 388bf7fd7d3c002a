// ScriptStep: one line of a script, checked.
#pragma once

#include <cstddef>
#include <string>

#include "wire/Request.h"

namespace tarn::script {

struct ScriptStep {
  enum class Kind {
    Request,     // a remote operation
    Sleep,       // wait so many seconds
    Disconnect,  // close the client's connection
  };

  std::size_t line = 0;
  Kind kind = Kind::Request;
  std::string op;      // the operation as the script names it
  std::string client;  // names the connection
  wire::Request request;
  double seconds = 0;
};

// The connection of a line that names none.
inline constexpr const char* kDefaultClient = "main";

}  // namespace tarn::script
