// SPDX-License-Identifier: Apache-2.0
// SessionsAnswer: sessions of many devices, as a table or as JSON. Threads: one.
#pragma once

#include <vector>

#include "fleet/ask/FleetData.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/Terminal.h"

namespace tarn::fleet {

void printSessions(const std::vector<FleetSession>& sessions, bool asJson, ctl::Output& output,
                   const ctl::Terminal& terminal);

}  // namespace tarn::fleet
