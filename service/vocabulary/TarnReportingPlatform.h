// SPDX-License-Identifier: Apache-2.0
// The installed facilities: the one way in which the system reaches its platform.
#pragma once

namespace tarn {

namespace platform {
struct Facilities;
}

// Installs the facilities for everything that follows; they must outlive all use. Called by the entry point or by a
// test fixture, before any other part of the system runs. A null pointer takes them away again (for fixtures). What the
// process shared on the facilities before these goes with them (ProcessState.h). What is being taken away is still
// reachable and still logs while it goes. No other thread uses the system meanwhile.
void TarnReportingInstallFacilities(const platform::Facilities* facilities);

// The installed facilities. Threads: any. Ends the process with a line on standard error when none are installed. A
// load and a branch.
const platform::Facilities& TarnReportingFacilities() noexcept;

}  // namespace tarn
