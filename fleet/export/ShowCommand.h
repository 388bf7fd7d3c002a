// SPDX-License-Identifier: Apache-2.0
// What --show prints: the very messages that would leave, unpacked again.
#pragma once

#include <optional>
#include <ostream>
#include <string>

#include "fleet/format/Message.h"
#include "fleet/privacy/PrivacySieve.h"
#include "fleet/store/StoreTail.h"

namespace tarn::fleet {

// Appends a line of JSON for the batch, each of its runs, sessions and events; text that isn't UTF-8 is escaped.
void appendBatch(std::string& out, const v1::Batch& batch);

// All that a store has to send, from `since` on, then a line with what it is in all and a day. Epoch seconds.
[[nodiscard]] Status showStore(StoreTail& store, PrivacySieve& sieve, const std::string& device,
                               std::optional<double> since, double now, std::ostream& out);

}  // namespace tarn::fleet
