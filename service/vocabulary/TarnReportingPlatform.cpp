#include "service/vocabulary/TarnReportingPlatform.h"

#include <cstdio>
#include <cstdlib>
#include <memory>

#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingInstallation.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingSignpost.h"

namespace tarn {

namespace {

// Not atomic: it changes only while no other thread uses the system.
// NOLINTNEXTLINE(cppcoreguidelines-avoid-non-const-global-variables): one for the process, that is its point
constinit std::unique_ptr<detail::Installation> standing;

}  // namespace

void TarnReportingInstallFacilities(const platform::Facilities* facilities) {
  // The old answers go while their facilities can still be reached: letting go of a queue may run what it held.
  if (standing != nullptr) {
    standing->serverQueue.reset();
  }
  detail::installedLog = facilities == nullptr ? nullptr : &facilities->log;
  detail::installSignposts(facilities == nullptr ? nullptr : facilities->signposts);
  standing = facilities == nullptr ? nullptr : std::make_unique<detail::Installation>(*facilities);
}

const platform::Facilities& TarnReportingFacilities() noexcept {
  return detail::currentInstallation().facilities;
}

namespace detail {

Installation& currentInstallation() noexcept {
  if (standing == nullptr) {
    static_cast<void>(std::fputs("tarnkit: the platform's facilities are not installed\n", stderr));
    std::abort();
  }
  return *standing;
}

}  // namespace detail

}  // namespace tarn
