// SPDX-License-Identifier: Apache-2.0
// FakeConnection: one client's connection; the test plays the client by calling the exported object.
//
// Threads: one at a time.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "platform/Listener.h"

namespace tarn::testing {

class FakeConnection final : public platform::Connection, public std::enable_shared_from_this<FakeConnection> {
 public:
  explicit FakeConnection(std::int32_t processIdentifier, std::int64_t number = 1, std::uint32_t user = 1000)
      : processIdentifier_(processIdentifier), number_(number), user_(user) {}
  FakeConnection(const FakeConnection&) = delete;
  FakeConnection& operator=(const FakeConnection&) = delete;

  // The interface.
  std::int32_t processIdentifier() const override { return processIdentifier_; }
  std::int64_t number() const override { return number_; }
  std::uint32_t user() const noexcept override { return user_; }
  std::string description() const override;
  void setExportedObject(std::shared_ptr<platform::TarnReportingServiceProtocol> object) override;
  void setInterruptionHandler(Handler handler) override;
  void setInvalidationHandler(Handler handler) override;
  void resume() override {
    resumed_ = true;
    wasWholeAtResume_ = exportedObject_ && interruptionHandler_ && invalidationHandler_;
  }

  // Controls.
  // Breaks the connection; invalidate() is left to the test.
  void interrupt();
  // Ends the connection: calls the invalidation handler, once, then lets go of the handlers and the exported object.
  void invalidate();

  // Observations.
  // What the client talks to; null before the service has set it and when the connection is over.
  const std::shared_ptr<platform::TarnReportingServiceProtocol>& exportedObject() const noexcept {
    return exportedObject_;
  }
  bool resumed() const noexcept { return resumed_; }
  // Whether the exported object and both handlers were there when it was resumed: what comes after would miss them.
  bool wasWholeAtResume() const noexcept { return wasWholeAtResume_; }
  bool invalidated() const noexcept { return invalidated_; }

 private:
  const std::int32_t processIdentifier_;
  const std::int64_t number_;
  const std::uint32_t user_;
  std::shared_ptr<platform::TarnReportingServiceProtocol> exportedObject_;
  Handler interruptionHandler_;
  Handler invalidationHandler_;
  bool resumed_ = false;
  bool wasWholeAtResume_ = false;
  bool invalidated_ = false;
};

}  // namespace tarn::testing
