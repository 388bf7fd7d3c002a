// SPDX-License-Identifier: Apache-2.0
// FakePerformanceTraceService: a trace facility that records nothing but makes its callbacks: each step succeeds, and
// the trace ends up at "/device/traces/1" (2, ...), until a test says otherwise.
//
// Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "platform/PerformanceTraceService.h"
#include "testing/backends/ReplyFaults.h"

namespace tarn::testing {

class FakePerformanceTraceService final : public platform::PerformanceTraceService {
 public:
  struct Trace {
    platform::PerformanceTraceConfiguration configuration;
    std::size_t starts = 0;
    std::size_t stops = 0;
    bool released = false;     // nobody holds the session any more
    bool hasDelegate = false;  // one was set and not taken away
  };

  FakePerformanceTraceService();
  ~FakePerformanceTraceService() override;
  FakePerformanceTraceService(const FakePerformanceTraceService&) = delete;
  FakePerformanceTraceService& operator=(const FakePerformanceTraceService&) = delete;

  // The interface.
  std::shared_ptr<platform::PerformanceTraceSession> createSession(
      const platform::PerformanceTraceConfiguration& configuration) override;

  // Controls. An error of nothing means that the step succeeds.
  void setMakesSessions(bool makes);
  void failStart(Status error);
  void failStop(Status error);
  void failCompletion(Status error);
  // How many events finished traces say that they lack.
  void setEventsLeftOut(std::uint64_t count);
  // How the callbacks come. A start is one delivery; so is a stop, with its two callbacks.
  ReplyFaults& callbacks();

  // Observations.
  std::vector<Trace> traces() const;  // in the order in which their sessions were made

 private:
  class Session;
  struct Ledger;

  const std::shared_ptr<Ledger> ledger_;
};

}  // namespace tarn::testing
