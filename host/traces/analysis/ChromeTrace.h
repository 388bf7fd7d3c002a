// SPDX-License-Identifier: Apache-2.0
// ChromeTrace: the signpost intervals of a file in the trace-event format, ours or another program's.
//
// Read are complete events (phase X) and begins and ends (B, E), which are paired by thread, the innermost first: an
// end that names another interval than the innermost closes the nearest one of that name, and what lay in between had
// no end. Events without their partner, their time or a sensible duration give no interval. An interval's subsystem is
// the first of the event's categories, up to the comma.
//
// The file is read into memory whole. Its size, its events and the depth of its values are bounded; a file beyond the
// bounds, one that isn't whole and one that isn't such a trace are failures. Nothing is thrown. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Result.h"

namespace tarn::trace_analysis {

// Beyond any of these the whole file is refused: half a trace would give wrong intervals. Files of our own are at most
// 64 MiB, by their default; other programs write larger ones.
struct TraceLimits {
  std::uint64_t mostBytes = std::uint64_t{256} << 20U;
  std::size_t mostEvents = 2'000'000;
  std::size_t mostDepth = 64;
};

// 24 bytes each: a trace may hold a million.
struct Interval {
  std::int64_t begin = 0;       // nanoseconds
  std::int64_t duration = 0;    // nanoseconds
  std::uint32_t name = 0;       // in ChromeTrace::texts
  std::uint32_t subsystem = 0;  // likewise
};

// Each text once, however many intervals bear it.
struct ChromeTrace {
  std::vector<std::string> texts;
  std::vector<Interval> intervals;  // in the order of their begins, an outer one before those inside it
};

// Reads a regular file, blocking. An errno value for what the system refuses (ENODEV for what is no plain file, EFBIG
// beyond the limit), else the code is 0 and the text says what is wrong with the content. A file that is cut while it
// is read is no whole text.
Result<ChromeTrace> readTrace(const std::string& path, const TraceLimits& limits = {});
// The same of bytes in memory.
Result<ChromeTrace> parseTrace(std::string_view bytes, const TraceLimits& limits = {});

}  // namespace tarn::trace_analysis
