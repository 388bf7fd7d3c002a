// EventText: a recorded event as a line for people or for programs. Stateless. Threads: any.
#pragma once

#include <string>

#include "recorder/store/EventReader.h"

namespace tarn::ctl {

// {"id", "time", "backend", "name", "payload", "detail"}.
std::string eventJson(const recorder::EventRow& row);

// A table's line; columns are aligned for names of usual length.
std::string eventLine(const recorder::EventRow& row);
std::string eventHeading();

}  // namespace tarn::ctl
