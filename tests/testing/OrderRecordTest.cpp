// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/OrderRecord.h"

#include <gtest/gtest.h>

#include "testing/FakePlatform.h"

namespace tarn::testing {
namespace {

using Entries = std::vector<std::string>;

constexpr platform::LogCategory kCategory{"sys.example", "code"};

TEST(OrderRecord, HoldsTheOrderAcrossTheFakesOfAPlatform) {
  FakePlatform platform;
  platform.order.start();
  platform.log.write({kCategory, platform::LogLevel::Info, "Module", 7, "                   Module:7     text"});
  EXPECT_TRUE(platform.notifications.post("name", {}));
  platform.gyre.requestGyre({});
  EXPECT_TRUE(platform.defaults.setValue("suite", "key", 1));
  platform.conditions.makeCondition()->waitFor(std::chrono::seconds(1));
  platform.snare.createReporter()->cancelSession("capture");
  EXPECT_EQ(platform.order.entries(),
            (Entries{"log text", "post name", "gyre", "store key", "wait", "snare reporter", "snare cancel capture"}));
}

TEST(OrderRecord, IsEmptyUntilItIsStartedAndBeginsAnewWithEachStart) {
  FakePlatform platform;
  platform.gyre.requestGyre({});
  EXPECT_TRUE(platform.order.entries().empty());
  platform.order.start();
  platform.gyre.requestGyre({});
  EXPECT_EQ(platform.order.entries().size(), 1U);
  platform.order.start();
  EXPECT_TRUE(platform.order.entries().empty());
}

TEST(OrderRecord, TellsItsObserverOfEachEntry) {
  FakePlatform platform;
  Entries seen;
  platform.order.start([&seen](const std::string& entry) { seen.push_back(entry); });
  platform.gyre.requestGyre({});
  EXPECT_EQ(seen, (Entries{"gyre"}));
}

}  // namespace
}  // namespace tarn::testing
