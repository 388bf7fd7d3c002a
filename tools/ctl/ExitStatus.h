// ExitStatus: how tarnreportingctl ends. Part of its contract with scripts.
#pragma once

namespace tarn::ctl {

inline constexpr int kSuccess = 0;
inline constexpr int kFailure = 1;       // what no other number says
inline constexpr int kWrongUsage = 64;   // the command line
inline constexpr int kBadInput = 65;     // a script, a JSON text, a defaults file
inline constexpr int kUnreachable = 69;  // no service listens on the socket, or the connection to it broke

}  // namespace tarn::ctl
