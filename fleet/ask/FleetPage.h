// SPDX-License-Identifier: Apache-2.0
// FleetPage: what a fleet did as one page, in the frame of all pages (tools/report/PageFrame.h). Pure. Threads: any.
#pragma once

#include <string>

#include "fleet/ask/FleetData.h"

namespace tarn::fleet {

std::string fleetPage(const FleetPicture& picture);

}  // namespace tarn::fleet
