// SPDX-License-Identifier: Apache-2.0
#include "testing/ManualConditions.h"

#include <gtest/gtest.h>

#include <mutex>
#include <thread>

namespace tarn::testing {
namespace {

using namespace std::chrono_literals;

TEST(ManualConditions, WaitTimesOutAtOnceByDefault) {
  ManualConditions conditions;
  const auto condition = conditions.makeCondition();
  const std::lock_guard lock(*condition);
  EXPECT_FALSE(condition->waitFor(60s));
  EXPECT_EQ(conditions.timeouts(), std::vector<std::chrono::duration<double>>{60s});
}

TEST(ManualConditions, SignalDuringTheWaitWakesIt) {
  ManualConditions conditions;
  const auto condition = conditions.makeCondition();
  conditions.onWait([&](auto) {
    std::thread signaller([&] {
      const std::lock_guard lock(*condition);  // the wait has unlocked it
      condition->signal();
    });
    signaller.join();
    return WaitEnd::TimesOut;
  });
  const std::lock_guard lock(*condition);
  EXPECT_TRUE(condition->waitFor(1s));
}

TEST(ManualConditions, SignalBeforeTheWaitIsNotRemembered) {
  ManualConditions conditions;
  const auto condition = conditions.makeCondition();
  const std::lock_guard lock(*condition);
  condition->signal();
  EXPECT_FALSE(condition->waitFor(1s));
}

TEST(ManualConditions, HookMayWakeWithoutASignal) {
  ManualConditions conditions;
  conditions.onWait([](auto) { return WaitEnd::Wakes; });
  const auto condition = conditions.makeCondition();
  const std::lock_guard lock(*condition);
  EXPECT_TRUE(condition->waitFor(1s));
  EXPECT_EQ(conditions.made().front()->signals(), 0U);
}

}  // namespace
}  // namespace tarn::testing
