// The check that code bound to the server queue makes of its callers.
#pragma once

namespace tarn {

// Ends the process when the caller doesn't run as work of the server queue: what it is about to touch is guarded by
// nothing else.
void TarnReportingRequireServerQueue() noexcept;
// Whether the caller runs so: for an assertion where every message passes and the check would be felt.
bool TarnReportingIsOnServerQueue() noexcept;

}  // namespace tarn
