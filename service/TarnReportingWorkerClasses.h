// The table of worker classes. Its order is the order in which a session makes its workers and, within consumers,
// producers and the rest, starts and stops them.
#pragma once

#include <span>

#include "session/TarnReportingSessionWorkerClass.h"

namespace tarn {

// All of them, in order. The table is static. Threads: any.
std::span<const TarnReportingSessionWorkerClass> TarnReportingWorkerClasses();

}  // namespace tarn
