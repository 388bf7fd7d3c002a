// The installed facilities: the one way in which the system reaches its platform.
#pragma once

namespace tarn {

namespace platform {
struct Facilities;
}

// Installs the facilities for everything that follows; they must outlive all use. Called by the entry point or by a
// test fixture, before any other part of the system runs. A null pointer takes them away again (for fixtures). What the
// process shared on the facilities before these goes with them (ProcessState.h).
void TarnReportingInstallFacilities(const platform::Facilities* facilities);

// The installed facilities. Threads: any.
const platform::Facilities& TarnReportingFacilities() noexcept;

}  // namespace tarn
