// SPDX-License-Identifier: Apache-2.0
// logPrefixed: the log lines of the host's own parts (loop, listener, connections) in the form of all others: the text
// stands after the prefix "%25s:%-5d " (module, line). Threads: any.
//
// An entry below the log's threshold costs one load. `module` names the part that speaks and is a text of the program,
// as the flood guard keeps it; `line` is the caller's own, by the default argument.
#pragma once

#include <string>
#include <string_view>

#include "host/system/SystemError.h"
#include "platform/Log.h"

namespace tarn::linux_host {

// What happens on a client's connection.
inline constexpr platform::LogCategory kConnectionCategory{"sys.oxbow.tarnkit", "tarnrc"};
// Everything else of the host: listener, loop, signals, watchdog.
inline constexpr platform::LogCategory kHostCategory{"sys.oxbow.tarnkit", "tarnrs"};
// The driver report channels.
inline constexpr platform::LogCategory kDriverCategory{"sys.oxbow.tarnkit", "tarnrd"};
// The performance traces and their analysis.
inline constexpr platform::LogCategory kTraceCategory{"sys.oxbow.tarnkit", "tarnrt"};

// Where memory is missing for the line, a short one stands in its place.
void logPrefixed(platform::Log& log, const platform::LogCategory& category, platform::LogLevel level,
                 std::string_view module, std::string_view text, int line = __builtin_LINE()) noexcept;

// The text with the prefix of its module and line, as every line has it: the module right-aligned to 25 columns. For
// those who write the entry themselves.
std::string prefixed(std::string_view module, std::string_view text, int line = __builtin_LINE());

}  // namespace tarn::linux_host
