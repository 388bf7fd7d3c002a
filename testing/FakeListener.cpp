// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeListener.h"

#include <utility>

namespace tarn::testing {

void FakeListener::setDelegate(std::weak_ptr<platform::ListenerDelegate> delegate) {
  delegate_ = std::move(delegate);
}

std::shared_ptr<FakeConnection> FakeListener::connect(std::int32_t processIdentifier) {
  const auto delegate = delegate_.lock();
  if (!resumed_ || delegate == nullptr) return nullptr;
  auto connection = std::make_shared<FakeConnection>(processIdentifier, ++lastNumber_);
  if (!delegate->listenerShouldAcceptNewConnection(connection)) return nullptr;
  connections_.push_back(connection);
  return connection;
}

}  // namespace tarn::testing
