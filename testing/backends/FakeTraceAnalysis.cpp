// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeTraceAnalysis.h"

#include <utility>

namespace tarn::testing {

struct FakeTraceAnalysis::Content {
  Status openingError;
  Status intervalsError;
  std::vector<platform::SignpostInterval> intervals;
  std::vector<platform::TraceProbe> probes;
  std::vector<std::string> openedLocations;
  std::vector<plist::Dictionary> descriptions;
};

class FakeTraceAnalysis::Trace final : public platform::TraceModel {
 public:
  explicit Trace(std::shared_ptr<Content> content) : content_(std::move(content)) {}

  Result<std::vector<platform::SignpostInterval>> allSignpostIntervals() override {
    return {content_->intervals, content_->intervalsError};  // an error doesn't take away what was read before it
  }

 private:
  const std::shared_ptr<Content> content_;
};

class FakeTraceAnalysis::Library final : public platform::TraceAnalysisLibrary {
 public:
  explicit Library(std::shared_ptr<Content> content) : content_(std::move(content)) {}

  Result<std::shared_ptr<platform::TraceModel>> openTrace(std::string_view location) override {
    content_->openedLocations.emplace_back(location);
    if (content_->openingError.failed()) return {nullptr, content_->openingError};
    return {std::make_shared<Trace>(content_), {}};
  }

  std::vector<platform::TraceProbe> probesForDictionaries(const std::vector<plist::Dictionary>& descriptions,
                                                          platform::TraceModel&) override {
    content_->descriptions = descriptions;
    return content_->probes;
  }

 private:
  const std::shared_ptr<Content> content_;
};

FakeTraceAnalysis::FakeTraceAnalysis() : content_(std::make_shared<Content>()) {}
FakeTraceAnalysis::~FakeTraceAnalysis() = default;

platform::TraceAnalysis::Loaded FakeTraceAnalysis::load() {
  ++loads_;
  if (onLoad_) {
    onLoad_();
  }
  if (!missingClass_.empty()) return {nullptr, missingClass_};
  return {std::make_shared<Library>(content_), {}};
}

void FakeTraceAnalysis::failOpening(Status error) {
  content_->openingError = std::move(error);
}

void FakeTraceAnalysis::failIntervals(Status error) {
  content_->intervalsError = std::move(error);
}

void FakeTraceAnalysis::setIntervals(std::vector<platform::SignpostInterval> intervals) {
  content_->intervals = std::move(intervals);
}

void FakeTraceAnalysis::setProbes(std::vector<platform::TraceProbe> probes) {
  content_->probes = std::move(probes);
}

const std::vector<std::string>& FakeTraceAnalysis::openedLocations() const {
  return content_->openedLocations;
}

const std::vector<plist::Dictionary>& FakeTraceAnalysis::descriptions() const {
  return content_->descriptions;
}

}  // namespace tarn::testing
