// SPDX-License-Identifier: Apache-2.0
// The check that code bound to the server queue makes of its callers.
#pragma once

namespace tarn {

// Ends the process when the caller doesn't run as work of the server queue: what it is about to touch is guarded by
// nothing else. Writes a line to standard error first. Also in release builds: a race there would corrupt what all
// clients share.
void TarnReportingRequireServerQueue() noexcept;
// Whether the caller runs so: for an assertion where every message passes and the check would be felt.
bool TarnReportingIsOnServerQueue() noexcept;

}  // namespace tarn
