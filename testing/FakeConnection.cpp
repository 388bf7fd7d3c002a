// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeConnection.h"

#include <utility>

#include "platform/TarnReportingServiceProtocol.h"

namespace tarn::testing {

std::string FakeConnection::description() const {
  return "connection from pid " + std::to_string(processIdentifier_);
}

void FakeConnection::setExportedObject(std::shared_ptr<platform::TarnReportingServiceProtocol> object) {
  exportedObject_ = std::move(object);
}

void FakeConnection::setInterruptionHandler(Handler handler) {
  interruptionHandler_ = std::move(handler);
}

void FakeConnection::setInvalidationHandler(Handler handler) {
  invalidationHandler_ = std::move(handler);
}

void FakeConnection::interrupt() {
  const auto self = weak_from_this().lock();  // the handler may let go of the last owner
  if (!invalidated_ && interruptionHandler_) {
    interruptionHandler_();
  }
}

void FakeConnection::invalidate() {
  const auto self = weak_from_this().lock();
  if (std::exchange(invalidated_, true)) return;
  if (Handler handler = std::move(invalidationHandler_)) {
    handler();
  }
  interruptionHandler_.reset();
  exportedObject_.reset();
}

}  // namespace tarn::testing
