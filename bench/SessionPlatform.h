// SPDX-License-Identifier: Apache-2.0
// SessionPlatform: the platform under sessions that are measured in this process: the fakes of the tests, but for the
// facilities that a message meets, since the fakes note down everything. The back-ends that a device may lack are
// missing until they are offered, so their workers decline.
//
// Installed for as long as it lives; one at a time. Threads: one.
#pragma once

#include <string>

#include "host/machine/LinuxClock.h"
#include "host/machine/LinuxFileSystem.h"
#include "host/traces/LinuxSignposts.h"
#include "platform/Facilities.h"
#include "platform/TallyService.h"
#include "platform/TracePoints.h"
#include "testing/FakePlatform.h"

namespace tarn::bench {

// What the analytics service does with events.
enum class Tally {
  WantsNothing,
  TakesEverything,  // asks for each payload and drops it
};

class SessionPlatform {
 public:
  // `directory`: where files go, on the real disk.
  explicit SessionPlatform(Tally tally, const std::string& directory = "/nonexistent");
  SessionPlatform(const SessionPlatform&) = delete;
  SessionPlatform& operator=(const SessionPlatform&) = delete;

  // From here on the build is internal and the device has all that the diagnostic workers need, their settings on; to
  // be called before the first session is made. The back-ends are fakes, which a message that nobody wants never meets.
  void offerDiagnostics();

  linux_host::LinuxSignposts& signposts() noexcept { return signposts_; }

 private:
  class DroppingTally final : public platform::TallyService {
   public:
    explicit DroppingTally(Tally tally) : takes_(tally == Tally::TakesEverything) {}
    bool eventIsInUse(std::string_view) override { return takes_; }
    void sendEventLazy(std::string_view, PayloadCallback payload) override;

   private:
    const bool takes_;
  };
  class NoTracePoints final : public platform::TracePoints {
   public:
    void emit(std::uint32_t, std::int64_t) noexcept override {}
  };

  testing::FakePlatform fakes_;
  linux_host::LinuxClock clock_;
  linux_host::LinuxFileSystem fileSystem_;
  DroppingTally tally_;
  NoTracePoints tracePoints_;
  linux_host::LinuxSignposts signposts_{clock_};
  platform::Facilities facilities_;
};

}  // namespace tarn::bench
