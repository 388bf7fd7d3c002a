// SPDX-License-Identifier: Apache-2.0
// TopAnswer: whose overloads come most often, as tables or as JSON. Threads: one.
#pragma once

#include <string>

#include "fleet/ask/AskOptions.h"
#include "fleet/ask/FleetData.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/Terminal.h"

namespace tarn::fleet {

void printTop(const PlayedParts& parts, const TopArguments& wished, ctl::Output& output, const ctl::Terminal& terminal);

}  // namespace tarn::fleet
