// SPDX-License-Identifier: Apache-2.0
// The accessory registration, which declines every session.
#include <gtest/gtest.h>

#include <csignal>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class Registration : public ServiceFixture {};

TEST_F(Registration, DeclinesASessionAndSaysSo) {
  ASSERT_TRUE(startService({"--log-level", "debug"}));
  play(R"({"op":"createReportingSession","reporterID":1}
{"op":"startReportingSessionForID","reporterID":1}
{"op":"stopReportingSessionForID","reporterID":1}
)");
  ASSERT_EQ(stopService(SIGTERM), 0);  // all of the log is written then
  EXPECT_TRUE(logWillSay(" debug tarnrz TarnReportingSessionAudioRegistrationWorker:"));
  EXPECT_TRUE(logWillSay(" TarnReportingSessionAudioRegistrationWorker unsupported\n"));
  EXPECT_TRUE(logWillSay("action=failure worker=TarnReportingSessionAudioRegistrationWorker reporterID=1"));
}

}  // namespace
}  // namespace tarn::e2e
