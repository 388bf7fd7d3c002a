// SPDX-License-Identifier: Apache-2.0
// What the recorder's file goes through: damage, retention, patterns; and that the ledger adds up.
#include <sqlite3.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>

#include "recorder/store/rows/Connection.h"
#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class RecorderFile : public ServiceFixture {
 protected:
  bool startConfigured(const std::string& toml) {
    writeFile(directory_ / "service.toml", toml);
    return startService({"--config", directory_ / "service.toml"});
  }
  std::string database() const { return state() + "/recorder.sqlite3"; }
};

TEST_F(RecorderFile, AFileThatIsNoDatabaseIsSetAsideAndAFreshOneBegun) {
  const std::string junk = "this is no database, but somebody may still want it\n";
  writeFile(database(), junk);
  ASSERT_TRUE(startService());
  play("{\"op\":\"sendMessage\",\"category\":4,\"type\":1,\"message\":{}}\n");
  EXPECT_EQ(eventsOnceThereAre(2, "*.Playback.Start").size(), 2U);
  EXPECT_TRUE(logWillSay(" error ")) << serviceLog();
  bool isKept = false;
  for (const auto& entry : std::filesystem::directory_iterator(state())) {
    isKept = isKept || (entry.is_regular_file() && entry.path() != database() && contentOf(entry.path()) == junk);
  }
  EXPECT_TRUE(isKept);
}

TEST_F(RecorderFile, OnlyEventsThatSomebodyWantsAreRecorded) {
  ASSERT_TRUE(startConfigured("[tally]\nin_use = [\"sys.oxbow.standalone.*\"]\n[rtc]\navailable = false\n"));
  play(R"({"op":"sendMessage","category":4,"type":1,"message":{}}
{"op":"sendMessage","category":4,"type":2,"message":{}}
)");
  eventsOnceThereAre(2, "*");
  EXPECT_EQ(names(events()),
            (std::vector<std::string>{"sys.oxbow.standalone.Playback.Start", "sys.oxbow.standalone.Playback.Stop"}));
  EXPECT_EQ(ledgerAtRest().at("recorder_handed_over"), 2);
}

TEST_F(RecorderFile, TheOldestEventsGoWhenTheFileGrowsTooLarge) {
  ASSERT_TRUE(startConfigured("[recorder]\nmax_megabytes = 1\n"));
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  const std::string text(10000, 'x');
  for (int index = 0; index < 400; ++index) {
    ASSERT_EQ(
        client->send(client::sendMessage({{"number", index}, {"text", text}}, 4, 1, std::vector<std::int64_t>{1})),
        client::SendStatus::Sent);
  }
  ASSERT_TRUE(client->call(client::getAllReporters()).ok());
  ASSERT_TRUE(eventually([this] { return status().at("recorder_expired") > 0; })) << status().dump();
  const json ledger = ledgerAtRest();
  const json expected{{std::to_string(::geteuid()), ledger.at("recorder_expired")}};
  EXPECT_EQ(ledger.at("recorder_expired_by_user"), expected);
  const auto left = events("*.Playback.Start");
  ASSERT_FALSE(left.empty());
  EXPECT_LT(left.size(), 800U);
  EXPECT_GT(left.front().id, 1);
  EXPECT_EQ(left.back().payload.at("number"), 399);
}

TEST_F(RecorderFile, AReaderThatHoldsUpTheLogIsNamedOnceAndLosesNobodyAnything) {
  ASSERT_TRUE(startService());
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  const auto send = [&](int first, int count) {
    const std::string text(120'000, 'x');
    for (int number = first; number < first + count; ++number) {
      const plist::Dictionary message{{"number", number}, {"text", text + std::to_string(number)}};
      ASSERT_EQ(client->send(client::sendMessage(message, 4, 1, std::vector<std::int64_t>{1})),
                client::SendStatus::Sent);
    }
    ASSERT_TRUE(client->call(client::settle(), kDeadline).ok());
  };
  send(0, 1);
  recorder::Connection reader;
  ASSERT_EQ(reader.open(database(), SQLITE_OPEN_READONLY), SQLITE_OK);
  ASSERT_EQ(reader.run("BEGIN; SELECT count(*) FROM events"), SQLITE_OK);
  constexpr int kMessages = 700;  // twice their bytes, as each is two events
  send(1, kMessages);
  const std::string held = "held up by readers of an old state: process " + std::to_string(::getpid()) + " (tests_e2e)";
  EXPECT_TRUE(logWillSay(held)) << serviceLog();
  EXPECT_EQ(serviceLog().find(held), serviceLog().rfind(held));
  ASSERT_EQ(reader.run("COMMIT"), SQLITE_OK);
  reader.close();
  send(kMessages + 1, 1);
  const json ledger = ledgerAtRest();
  EXPECT_EQ(ledger.at("recorder_failed"), 0);
  EXPECT_EQ(ledger.at("recorder_committed"), ledger.at("recorder_handed_over"));
}

TEST_F(RecorderFile, EventsStandInTheOrderOfTheirMessages) {
  ASSERT_TRUE(startService());
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  for (int index = 0; index < 1000; ++index) {
    ASSERT_EQ(client->send(client::sendMessage({{"number", index}}, 4, 1, std::vector<std::int64_t>{1})),
              client::SendStatus::Sent);
  }
  ASSERT_TRUE(client->call(client::getAllReporters()).ok());
  const auto found = eventsOnceThereAre(1000, "sys.oxbow.tarnkit.Playback.Start");
  ASSERT_EQ(found.size(), 1000U);
  for (std::size_t index = 0; index < found.size(); ++index) {
    ASSERT_EQ(found[index].payload.at("number"), index);
  }
}

TEST_F(RecorderFile, TheLedgerAddsUpAtAnyMomentAndIsZeroAtRest) {
  ASSERT_TRUE(startService());
  const auto client = connect();
  ASSERT_TRUE(client->call(client::createReportingSession(1)).ok());
  const auto watcher = connect();
  for (int round = 0; round < 50; ++round) {
    for (int index = 0; index < 100; ++index) {
      ASSERT_EQ(
          client->send(client::sendMessage({{"number", round * 100 + index}}, 4, 1, std::vector<std::int64_t>{1})),
          client::SendStatus::Sent);
    }
    ASSERT_TRUE(client->flush());
    const plist::Dictionary ledger = watcher->call(client::status()).dictionary();
    ASSERT_EQ(ledger.get("recorder_handed_over").asInt64(), ledger.get("recorder_committed").asInt64() +
                                                                ledger.get("recorder_waiting").asInt64() +
                                                                ledger.get("recorder_failed").asInt64());
  }
  ASSERT_TRUE(client->call(client::getAllReporters()).ok());
  const json ledger = ledgerAtRest();
  EXPECT_EQ(ledger.at("messages_received"), 5000);
  EXPECT_EQ(ledger.at("recorder_committed"), ledger.at("recorder_handed_over"));
  EXPECT_GE(ledger.at("recorder_committed"), 10000);
  EXPECT_EQ(ledger.at("recorder_failed"), 0);
  EXPECT_EQ(ledger.at("sessions"), 1);
  EXPECT_GE(ledger.at("frames_received"), ledger.at("replies_sent"));
}

TEST_F(RecorderFile, CheckTellsWhatIsLostByItsIdAndNeedsNoService) {
  EXPECT_EQ(ctl({"check", "--store"}).status, 1) << "there is no file yet";
  ASSERT_TRUE(startService());
  play("{\"op\":\"sendMessage\",\"category\":4,\"type\":1,\"message\":{}}\n");
  const std::size_t count = eventsOnceThereAre(2, "*").size();
  const Finished beside = ctl({"check", "--store"});
  EXPECT_EQ(beside.status, 0) << beside.complaints;
  EXPECT_EQ(beside.output.substr(0, 6), "whole ");
  EXPECT_GE(count, 2U);
  ASSERT_EQ(stopService(SIGTERM), 0);
  std::string bytes = contentOf(database());
  std::size_t found = 0;
  for (std::size_t at = 0; (at = bytes.find("Playback.Start", at)) != std::string::npos; ++found) {
    bytes[at] = 'p';
  }
  ASSERT_GT(found, 0U);
  writeFile(database(), bytes);
  const Finished alone = ctl({"check", "--store"});
  EXPECT_EQ(alone.status, 1);
  EXPECT_NE(alone.output.find("\nlost "), std::string::npos) << alone.output;
  EXPECT_EQ(ctl({"check", "--store", "--json"}).status, 64);
}

}  // namespace
}  // namespace tarn::e2e
