// SPDX-License-Identifier: Apache-2.0
// A session that runs for long: what its messages take of the memory is bounded, and its stop knows all of them.
#include <filesystem>

#include "client/Requests.h"
#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

// Stamps that are old are replaced, so these are far in the future.
constexpr double kZero = 4102444800;
constexpr int kMessages = 20'000;
constexpr int kMessagesOfSegment = 500;
constexpr std::size_t kBound = 1048576;
constexpr std::size_t kTextBytes = 1000;
constexpr std::chrono::seconds kPatience{40};

constexpr const char* kConfiguration = R"([tally]
in_use = ["sys.oxbow.tarnkit.Volume.Summary", "sys.oxbow.tarnkit.Session_Generic.Summary"]
[rtc]
available = false
[recorder]
max_megabytes = 1024
[limits]
log_bytes_per_session = 1048576
)";

class LongSession : public ServiceFixture {
 protected:
  bool startWith(const std::string& configuration) {
    writeFile(directory_ / "configuration.toml", configuration);
    return startService({"--config", directory_ / "configuration.toml"});
  }
  // The output runs all the while, and at every segment's begin with another volume.
  static plist::Dictionary payloadOf(int number) {
    static const std::string kText(kTextBytes, 'x');
    plist::Dictionary payload{{"n", number}, {"text", kText}, {"tarnreporting_timestamp", kZero + number}};
    if (number % kMessagesOfSegment == 0) {
      payload.set("session_output_running", number < kMessages);
      payload.set("KvSessionVolume", number / kMessagesOfSegment % 2 == 0 ? 0.25 : 0.75);
    }
    return payload;
  }
};

TEST_F(LongSession, ItsLogKeepsTheBoundAndTheStopDerivesFromAllMessages) {
  ASSERT_TRUE(startWith(kConfiguration));
  const auto client = connect();
  const auto send = [&](const client::Request& request) { ASSERT_EQ(client->send(request), client::SendStatus::Sent); };
  send(client::createReportingSession(7));
  const plist::Dictionary application{{"HostApplicationDisplayID", "org.app"}};
  send(client::setConfiguration(application, 7));
  send(client::startReportingSessionForID(7));
  for (int number = 0; number <= kMessages; ++number) {
    send(client::sendMessage(payloadOf(number), 4, 3, wire::ReporterIDs(std::vector<std::int64_t>{7})));
    if (number % 2000 == 0) {
      EXPECT_LE(status()["log_bytes"], kBound);
    }
  }
  ASSERT_TRUE(client->flush());
  ASSERT_TRUE(eventually(
      [&] {
        client->dispatch();
        return client->outstanding() == 1;  // the start's
      },
      kPatience));
  const json running = status();
  EXPECT_LE(running["log_bytes"], kBound);
  EXPECT_GT(running["log_overflow_bytes"], kMessages * kTextBytes - kBound);
  EXPECT_EQ(running["log_overflow_sessions"], 1);
  ASSERT_TRUE(client->call(client::stopReportingSessionForID(7), kPatience).ok());

  const auto volumes = eventsOnceThereAre(kMessages / kMessagesOfSegment, "*.Volume.Summary");
  ASSERT_EQ(volumes.size(), static_cast<std::size_t>(kMessages / kMessagesOfSegment));
  for (std::size_t index = 0; index < volumes.size(); ++index) {
    EXPECT_EQ(volumes[index].payload["play_seconds"], kMessagesOfSegment);
    EXPECT_EQ(volumes[index].payload["KvSessionVolume"], index % 2 == 0 ? 0.25 : 0.75);
    EXPECT_EQ(volumes[index].payload["msgidx"], index + 1);
    EXPECT_EQ(volumes[index].payload["msgcnt"], volumes.size());
  }
  const auto summaries = eventsOnceThereAre(1, "*.Session_Generic.Summary");
  ASSERT_EQ(summaries.size(), 1U);
  // The markers of start and stop, and what was derived before the summary.
  EXPECT_GE(summaries[0].payload["num_unique_messages"], kMessages + 3);
  EXPECT_EQ(summaries[0].payload["num_messages"], kMessages + 1 + static_cast<int>(volumes.size()));
  const json stopped = ledgerAtRest();
  EXPECT_EQ(stopped["log_bytes"], 0);
  EXPECT_EQ(stopped["log_overflow_bytes"], 0);
  EXPECT_EQ(stopped["log_messages_lost"], 0);
  EXPECT_TRUE(logWillSay("its oldest messages wait on disk until the session stops. reporterID=7"));
}

TEST_F(LongSession, KilledServiceLeavesNothingOfItBehind) {
  ASSERT_TRUE(startWith("[limits]\nlog_bytes_per_session = 65536\n"));
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(7)).ok());
  for (int number = 0; number < 500; ++number) {
    const auto request = client::sendMessage(payloadOf(number), 4, 3, wire::ReporterIDs(std::vector<std::int64_t>{7}));
    ASSERT_TRUE(client->call(request).ok());
  }
  ASSERT_GT(status()["log_overflow_bytes"], 0);
  service().signal(9);
  ASSERT_EQ(service().wait(), 128 + 9);
  for (const auto& entry : std::filesystem::directory_iterator(state())) {
    EXPECT_EQ(entry.path().filename().string().find("overflow"), std::string::npos) << entry.path();
  }
}

}  // namespace
}  // namespace tarn::e2e
