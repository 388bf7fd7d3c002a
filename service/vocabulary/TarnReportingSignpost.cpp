#include "service/vocabulary/TarnReportingSignpost.h"

namespace tarn::detail {

namespace {

constinit const std::atomic<bool> kNeverOn{false};

// Not atomic: it changes only while no other thread uses the system.
// NOLINTNEXTLINE(cppcoreguidelines-avoid-non-const-global-variables): one for the process, as the facilities are
constinit platform::Signposts* installed = nullptr;

}  // namespace

// NOLINTNEXTLINE(cppcoreguidelines-avoid-non-const-global-variables)
constinit const std::atomic<bool>* signpostSwitch = &kNeverOn;

void installSignposts(platform::Signposts* signposts) noexcept {
  installed = signposts;
  signpostSwitch = signposts == nullptr ? &kNeverOn : &signposts->recordingSwitch();
}

std::optional<OpenSignpost> beginSignpost(const platform::Signpost& signpost) noexcept {
  return OpenSignpost{installed, signpost, installed->begin()};
}

}  // namespace tarn::detail
