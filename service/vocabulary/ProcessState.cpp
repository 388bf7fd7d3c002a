// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/ProcessState.h"

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <utility>

#include "platform/Facilities.h"
#include "platform/Signposts.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingSignpost.h"

namespace tarn {

namespace {

constinit const std::atomic<bool> kNeverOn{false};

// Not atomic, as the two below: they change only while no other thread uses the system.
// NOLINTNEXTLINE(cppcoreguidelines-avoid-non-const-global-variables): one for the process, that is its point
constinit std::unique_ptr<ProcessState> standing;

}  // namespace

namespace detail {

// Copied out of the facilities, so that a level or a trace that is off costs one load and one branch.
// NOLINTBEGIN(cppcoreguidelines-avoid-non-const-global-variables)
constinit const platform::Log* installedLog = nullptr;
constinit const std::atomic<bool>* signpostSwitch = &kNeverOn;
// NOLINTEND(cppcoreguidelines-avoid-non-const-global-variables)

}  // namespace detail

void TarnReportingInstallFacilities(const platform::Facilities* facilities) {
  // While it goes it can still be asked, and lines are still written.
  if (standing != nullptr) {
    standing->clear();
    standing.reset();
  }
  platform::Signposts* const signposts = facilities == nullptr ? nullptr : facilities->signposts;
  detail::installedLog = facilities == nullptr ? nullptr : &facilities->log;
  detail::signpostSwitch = signposts == nullptr ? &kNeverOn : &signposts->recordingSwitch();
  if (facilities != nullptr) {
    standing = std::make_unique<ProcessState>(*facilities);
  }
}

const platform::Facilities& TarnReportingFacilities() noexcept {
  return ProcessState::current().facilities;
}

ProcessState& ProcessState::current() noexcept {
  if (standing == nullptr) {
    static_cast<void>(std::fputs("tarnkit: the platform's facilities are not installed\n", stderr));
    std::abort();
  }
  return *standing;
}

// Letting go of a queue may run what it held, and the end of one state may ask for another: until there is none.
void ProcessState::clear() {
  serverQueue.reset();
  while (const std::shared_ptr<void> last = takeLast()) {
  }
}

std::shared_ptr<void> ProcessState::find(const void* tag, std::shared_ptr<void> (*make)()) {
  const MutexLock lock(mutex_);
  const auto found =
      std::find_if(entries_.begin(), entries_.end(), [tag](const Entry& entry) { return entry.tag == tag; });
  if (found != entries_.end()) return found->state;
  entries_.push_back({tag, make()});
  return entries_.back().state;
}

std::shared_ptr<void> ProcessState::takeLast() {
  const MutexLock lock(mutex_);
  if (entries_.empty()) return nullptr;
  std::shared_ptr<void> last = std::move(entries_.back().state);
  entries_.pop_back();
  return last;
}

}  // namespace tarn
