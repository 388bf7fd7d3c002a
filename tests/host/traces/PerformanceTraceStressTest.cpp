// SPDX-License-Identifier: Apache-2.0
// Signposts from many threads while traces start, stop and are let go of; run under ThreadSanitizer as well.
#include <atomic>
#include <random>

#include "host/machine/LinuxClock.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingSignpost.h"
#include "testing/FakePlatform.h"
#include "tests/host/traces/PerformanceTraceFixture.h"
#include "tests/support/Seeds.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;

constexpr int kSpeakers = 4;
constexpr int kTraces = 120;

class PerformanceTraceStress : public PerformanceTraceFixture {
 protected:
  // Until the end of the scope.
  class Speakers {
   public:
    explicit Speakers(platform::Signposts& signposts) {
      platform_.facilities().signposts = &signposts;
      TarnReportingInstallFacilities(&platform_.facilities());
      for (int i = 0; i < kSpeakers; ++i) {
        threads_.emplace_back([this] {
          while (!ending_.load(std::memory_order_relaxed)) {
            const TarnReportingSignpost outer(SignpostCategory::Operation, "Speaker", "outer", {"reporterID", 7});
            const TarnReportingSignpost inner(SignpostCategory::Worker, "Speaker", "inner");
          }
        });
      }
    }
    ~Speakers() {
      ending_ = true;
      for (std::thread& thread : threads_) {
        thread.join();
      }
    }
    Speakers(const Speakers&) = delete;
    Speakers& operator=(const Speakers&) = delete;

   private:
    tarn::testing::FakePlatform platform_;
    std::atomic<bool> ending_{false};
    std::vector<std::thread> threads_;
  };
};

TEST_F(PerformanceTraceStress, TracesComeAndGoWhileThreadsSpeak) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937 random(seed);
    PerformanceTraceLimits limits;
    limits.mostBufferedEvents = 512;
    limits.mostBytes = 64 * 1024;
    limits.drainInterval = 1ms;
    make(limits);
    log_.setThreshold(platform::LogLevel::Error);
    const Speakers speakers(signposts_);
    int completed = 0;
    for (int i = 0; i < kTraces; ++i) {
      Trace trace = makeTrace(i % 2 == 0 ? 2 : 3);
      trace.session->startTrace();
      switch (random() % 4) {
        case 0:
          break;  // let go of right after the start
        case 1:
          EXPECT_TRUE(trace.delegate->waitFor("start"));
          break;
        case 2:
          trace.session->stopTrace();
          break;  // let go of right after the stop
        default: {
          EXPECT_TRUE(trace.delegate->waitFor("start"));
          const std::string text = finish(trace);
          EXPECT_TRUE(Json::accept(text));
          std::filesystem::remove(trace.delegate->location());
          ++completed;
        }
      }
    }
    EXPECT_GT(completed, 0);
    service_->shutdown();
    EXPECT_FALSE(signposts_.isRecording());
    for (const std::string& name : files()) {
      EXPECT_TRUE(name.ends_with(".json")) << name;
    }
  }
}

TEST_F(PerformanceTraceStress, SessionsAreDestroyedByManyThreadsWhileTheirCallbacksRun) {
  PerformanceTraceLimits limits;
  limits.drainInterval = 1ms;
  make(limits);
  std::vector<std::thread> owners;
  std::atomic<int> started{0};
  for (int i = 0; i < kSpeakers; ++i) {
    owners.emplace_back([&] {
      for (int each = 0; each < kTraces / kSpeakers; ++each) {
        Trace trace = makeTrace();
        trace.delegate->also = [&](const std::string& call) { started += call.starts_with("start") ? 1 : 0; };
        trace.session->startTrace();
        trace.session->stopTrace();
        if (each % 3 != 0) {
          EXPECT_TRUE(testing::eventually([&] { return !trace.delegate->calls().empty(); }));
        }
      }
    });
  }
  for (std::thread& owner : owners) {
    owner.join();
  }
  service_->shutdown();
  EXPECT_GE(started.load(), kTraces / kSpeakers * 2);
}

}  // namespace
}  // namespace tarn::linux_host
