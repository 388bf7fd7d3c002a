// SPDX-License-Identifier: Apache-2.0
// tarnreporting-export at work: the store, the cursor and where messages go, until a signal. Owned by main(). Threads:
// one.
#pragma once

#include <string>

#include "fleet/export/ExportOptions.h"
#include "fleet/privacy/FleetKey.h"

namespace tarn::fleet {

// The exit status. `device`: the device's name.
int runExport(const ExportOptions& options, const ExportConfiguration& configuration, const FleetKey& key,
              const std::string& device);

}  // namespace tarn::fleet
