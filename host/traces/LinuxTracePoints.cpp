// SPDX-License-Identifier: Apache-2.0
#include "host/traces/LinuxTracePoints.h"

#if __has_include(<sys/sdt.h>)
#include <sys/sdt.h>
#define TARN_PROBE(name, argument) DTRACE_PROBE1(tarnkit, name, argument)
#define TARN_PROBE_OTHER(code, argument) DTRACE_PROBE2(tarnkit, other, code, argument)
#else
#define TARN_PROBE(name, argument) static_cast<void>(argument)
#define TARN_PROBE_OTHER(code, argument) static_cast<void>(argument)
#endif

// The codes and the names of their probes, in one place: a probe's name is a word of the source, not a text.
#define TARN_TRACE_POINTS(POINT)       \
  POINT(0x21044814, operation_create)  \
  POINT(0x21044818, operation_start)   \
  POINT(0x2104481C, operation_stop)    \
  POINT(0x21044824, operation_send)    \
  POINT(0x21044828, session_created)   \
  POINT(0x2104482C, session_started)   \
  POINT(0x21044830, session_stopping)  \
  POINT(0x21044834, session_destroyed) \
  POINT(0x21044838, session_message)

namespace tarn::linux_host {

void LinuxTracePoints::emit(std::uint32_t code, std::int64_t argument) noexcept {
  switch (code) {
#define TARN_POINT(number, name) \
  case number:                   \
    TARN_PROBE(name, argument);  \
    break;
    TARN_TRACE_POINTS(TARN_POINT)
#undef TARN_POINT
    default:
      TARN_PROBE_OTHER(code, argument);
  }
  if (signposts_.isRecording()) [[unlikely]] {
    signposts_.mark({platform::SignpostCategory::TracePoint, "tracePoint", probeName(code), {"argument", argument}});
  }
}

std::string_view LinuxTracePoints::probeName(std::uint32_t code) noexcept {
  switch (code) {
#define TARN_POINT(number, name) \
  case number:                   \
    return #name;
    TARN_TRACE_POINTS(TARN_POINT)
#undef TARN_POINT
    default:
      return "other";
  }
}

}  // namespace tarn::linux_host
