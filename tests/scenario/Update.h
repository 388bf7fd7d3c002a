// SPDX-License-Identifier: Apache-2.0
// Update: expectations from what arrived. What still holds of the old ones stays as it is, so that a notation that was
// put in by hand isn't lost.
#pragma once

#include <vector>

#include "tests/scenario/Expectations.h"
#include "tests/scenario/Notation.h"
#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

// All events are of one script, as are the old expectations.
std::vector<ExpectedEvent> updated(const std::vector<ExpectedEvent>& old, const std::vector<RecordedEvent>& events,
                                   const Playing& playing);

}  // namespace tarn::scenario
