// SPDX-License-Identifier: Apache-2.0
// What tarnreporting-collect does when its options and its configuration are read.
#pragma once

#include "fleet/collect/CollectOptions.h"

namespace tarn::fleet {

// Until a signal ends it, or nothing is left to do; the exit status.
int runCollect(const CollectOptions& options, const CollectConfiguration& configuration);

}  // namespace tarn::fleet
