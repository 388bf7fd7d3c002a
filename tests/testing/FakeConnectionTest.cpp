// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeConnection.h"

#include <gtest/gtest.h>

#include <memory>

#include "testing/FakeListener.h"

namespace tarn::testing {
namespace {

class Delegate final : public platform::ListenerDelegate {
 public:
  explicit Delegate(bool accepts) : accepts_(accepts) {}
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<platform::Connection>& connection) override {
    connection->setInterruptionHandler([this] { ++interruptions; });
    connection->setInvalidationHandler([this] { ++invalidations; });
    connection->resume();
    return accepts_;
  }
  int interruptions = 0;
  int invalidations = 0;

 private:
  const bool accepts_;
};

TEST(FakeListener, ConnectsClientsThroughItsDelegate) {
  const auto delegate = std::make_shared<Delegate>(true);
  FakeListener listener;
  listener.setDelegate(delegate);
  listener.resume();
  const auto connection = listener.connect(77);
  ASSERT_NE(connection, nullptr);
  EXPECT_EQ(connection->processIdentifier(), 77);
  EXPECT_TRUE(connection->resumed());
  EXPECT_EQ(listener.connections().size(), 1U);
}

TEST(FakeListener, ConnectsNobodyBeforeItIsResumedNorWithoutADelegateNorWhenToldNo) {
  FakeListener listener;
  auto delegate = std::make_shared<Delegate>(true);
  listener.setDelegate(delegate);
  EXPECT_EQ(listener.connect(1), nullptr);
  listener.resume();
  delegate.reset();
  EXPECT_EQ(listener.connect(1), nullptr);
  const auto refusing = std::make_shared<Delegate>(false);
  listener.setDelegate(refusing);
  EXPECT_EQ(listener.connect(1), nullptr);
  EXPECT_TRUE(listener.connections().empty());
}

TEST(FakeConnection, InvalidationIsToldOnceAndNothingAfterIt) {
  const auto delegate = std::make_shared<Delegate>(true);
  FakeListener listener;
  listener.setDelegate(delegate);
  listener.resume();
  const auto connection = listener.connect(1);
  connection->interrupt();
  connection->invalidate();
  connection->invalidate();
  connection->interrupt();
  EXPECT_EQ(delegate->interruptions, 1);
  EXPECT_EQ(delegate->invalidations, 1);
  EXPECT_EQ(connection->exportedObject(), nullptr);
}

}  // namespace
}  // namespace tarn::testing
