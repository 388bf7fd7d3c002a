// SPDX-License-Identifier: Apache-2.0
// SessionTrace: a session's own timeline as a Chrome trace (JSON), which the usual viewers of traces open: a track each
// for its periods, its output, its input and its routes, a counter for the volume, marks for overloads and errors.
// Stateless. Threads: any.
#pragma once

#include <string>
#include <vector>

#include "recorder/store/reading/SessionReader.h"
#include "tools/ctl/sessions/SessionTimeline.h"

namespace tarn::ctl {

// The lines of one JSON object, an event each. Times are microseconds since 1970, by the messages' own stamps; a period
// is told by the stamps of its messages where these aren't of the time when they came. `now` closes what still runs.
std::vector<std::string> traceOf(const recorder::SessionRow& session, const std::vector<recorder::PeriodRow>& periods,
                                 const std::vector<SessionMessage>& messages, double now);

}  // namespace tarn::ctl
