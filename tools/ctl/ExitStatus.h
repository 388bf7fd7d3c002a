// ExitStatus: how tarnreportingctl ends. Part of its contract with scripts.
#pragma once

namespace tarn::ctl {

enum ExitStatus : int {
  kSuccess = 0,
  kFailure = 1,       // what no other number says
  kWrongUsage = 64,   // the command line
  kBadInput = 65,     // a script, a JSON text, a defaults file
  kUnreachable = 69,  // no service behind the socket, or the connection to it broke
};

}  // namespace tarn::ctl
