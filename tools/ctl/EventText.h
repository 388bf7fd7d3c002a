// SPDX-License-Identifier: Apache-2.0
// EventText: a recorded event as a line for people or for programs. Stateless. Threads: any.
#pragma once

#include <string>

#include "recorder/store/reading/EventReader.h"

namespace tarn::ctl {

// {"id", "time", "backend", "name", "payload", "detail"}, and "session" (null for nobody's) where the file has
// sessions. The time is in epoch seconds; payload and detail are the objects that were recorded. One line, whatever
// they hold.
std::string eventJson(const recorder::EventRow& row, bool hasSession);

// A table's line; columns are aligned for names of usual length. The time is in UTC with milliseconds, or epoch seconds
// beyond the years 1970 to 9999. Texts are printable(); an empty detail is left out.
std::string eventLine(const recorder::EventRow& row);
// The line above those.
std::string eventHeading();

}  // namespace tarn::ctl
