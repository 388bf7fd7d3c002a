// SPDX-License-Identifier: Apache-2.0
// FakeTraceAnalysis: an analysis library that finds in every trace what a test put there. Threads: one at a time.
#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/TraceAnalysis.h"

namespace tarn::testing {

class FakeTraceAnalysis final : public platform::TraceAnalysis {
 public:
  FakeTraceAnalysis();
  ~FakeTraceAnalysis() override;
  FakeTraceAnalysis(const FakeTraceAnalysis&) = delete;
  FakeTraceAnalysis& operator=(const FakeTraceAnalysis&) = delete;

  // The interface.
  Loaded load() override;

  // Controls.
  // What happens while the library is loaded.
  void onLoad(std::function<void()> hook) { onLoad_ = std::move(hook); }
  void setMissingClass(std::string name) { missingClass_ = std::move(name); }
  void failOpening(Status error);
  void failIntervals(Status error);
  void setIntervals(std::vector<platform::SignpostInterval> intervals);
  void setProbes(std::vector<platform::TraceProbe> probes);

  // Observations.
  std::size_t loads() const noexcept { return loads_; }
  const std::vector<std::string>& openedLocations() const;
  // The descriptions of the last request for probes.
  const std::vector<plist::Dictionary>& descriptions() const;

 private:
  class Library;
  class Trace;
  struct Content;

  const std::shared_ptr<Content> content_;
  std::function<void()> onLoad_;
  std::string missingClass_;
  std::size_t loads_ = 0;
};

}  // namespace tarn::testing
