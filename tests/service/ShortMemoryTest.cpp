// SPDX-License-Identifier: Apache-2.0
// Whichever allocation of an operation fails: what the service knows of its clients, sessions and messages stays whole.
#include <algorithm>
#include <cstddef>
#include <new>
#include <utility>

#include "plist/PackedBuilder.h"
#include "service/TarnReportingSessionIndex.h"
#include "tests/service/ServiceFixture.h"
#include "tests/support/FailingAllocations.h"

namespace tarn {
namespace {

using namespace testing;

class ServiceShortMemory : public ServiceFixture {
 protected:
  ServiceShortMemory() : client_(connect(41)), other_(connect(42)) {}

  // Calls `operation` and runs its work with that allocation failing. Whether one did.
  template <class Operation>
  bool runWithout(std::uint64_t ordinal, const Operation& operation) {
    bool happened = false;
    {
      const FailingAllocations failing(ordinal);
      try {
        operation();
        platform_.runUntilIdle();
      } catch (const std::bad_alloc&) {
      }
      happened = failing.happened();
    }
    platform_.runUntilIdle();  // what is left of it
    return happened;
  }
  // The same with a message that is made before.
  bool sendWithout(std::uint64_t ordinal, const Client& client, platform::ReporterIDs reporterIDs) {
    plist::Dictionary message{{"some text", "value"}, {"number", ordinal}};
    return runWithout(ordinal, [&] {
      client.remote().sendMessage(std::move(message), 4, 1, std::move(reporterIDs),
                                  [](const std::optional<platform::RemoteError>&) {});
    });
  }
  std::uint64_t counted() const {
    std::uint64_t all = 0;
    for (const std::uint64_t count : service_->messageCounts().counts) {
      all += count;
    }
    return all;
  }
  std::size_t sessionsOf(std::size_t client) const {
    return service_->getAllClients().at(client)->clientReportingSessionMap().size();
  }
  bool sessionRuns(std::int64_t reporterID) const { return sessionOf(0, reporterID)->started(); }
  std::ptrdiff_t runningWorkers(std::int64_t reporterID) const {
    const auto& workers = sessionOf(0, reporterID)->workers().messageWorkers();
    return std::count_if(workers.begin(), workers.end(), [](const auto& member) { return member.worker->started(); });
  }

  Client client_;
  Client other_;
  Answer<bool> held_;
};

TEST_F(ServiceShortMemory, EachMessageIsCountedOnce) {
  create(client_, 7);
  start(client_, 7, held_);
  std::uint64_t sent = 0;
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    ++sent;
    happened = sendWithout(ordinal, client_, std::vector<std::int64_t>{7});
    ASSERT_EQ(counted(), sent) << ordinal;
  }
  EXPECT_GT(sent, 5U);
  EXPECT_GT(service_->messageCounts().of(TarnReportingOutcome::Refused), 0U);
  EXPECT_EQ(send(client_, {{"last", 1}}, std::vector<std::int64_t>{7}), std::nullopt);
}

// Gives one message, as often as it is made.
class OneMessage final : public platform::MessageRun {
 public:
  explicit OneMessage(std::uint64_t number) : keys_(plist::Dictionary{{"some text", 1}, {"number", 1}}.keys()) {
    draft_.begin(64);
    draft_.add("value");
    draft_.add(number);
    draft_.finish(keys_);
    message_ = {&draft_, 4, 1, 7};
  }
  const Message* next() override { return std::exchange(given_, true) ? nullptr : &message_; }

 private:
  const plist::KeyList keys_;
  plist::PackedBuilder::Draft draft_;
  Message message_;
  bool given_ = false;
};

TEST_F(ServiceShortMemory, EachMessageOfARunIsCountedOnce) {
  create(client_, 7);
  start(client_, 7, held_);
  std::uint64_t sent = 0;
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    ++sent;
    OneMessage run(ordinal);
    const auto sendRun = [this, &run] { client_.remote().sendMessages(run); };
    happened = runWithout(ordinal, sendRun);
    ASSERT_EQ(counted(), sent) << ordinal;
  }
  EXPECT_GT(sent, 3U);
  EXPECT_GT(service_->messageCounts().of(TarnReportingOutcome::Refused), 0U);
  EXPECT_EQ(send(client_, {{"last", 1}}, std::vector<std::int64_t>{7}), std::nullopt);
}

TEST_F(ServiceShortMemory, EachBroadcastIsCountedOnce) {
  for (std::int64_t id = 1; id <= 3; ++id) {
    create(client_, id);
    start(client_, id, held_);
  }
  std::uint64_t sent = 0;
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    ++sent;
    happened = sendWithout(ordinal, other_, std::nullopt);
    ASSERT_EQ(counted(), sent) << ordinal;
  }
}

TEST_F(ServiceShortMemory, ASessionIsMadeAsAWholeOrNotAtAll) {
  std::int64_t id = 100;
  bool happened = true;
  std::size_t made = 0;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    ++id;
    happened = runWithout(ordinal, [&] { client_.remote().createReportingSession(id, [](const auto&, bool) {}); });
    const bool isThere = sessionOf(0, id) != nullptr;
    made += isThere ? 1 : 0;
    ASSERT_EQ(sessionsOf(0), made) << ordinal;
    ASSERT_EQ(service_->sessionCount(), made) << ordinal;
    ASSERT_EQ(service_->sessionIndex().firstHolder(id) != nullptr, isThere) << ordinal;
  }
  EXPECT_GT(id, 105);
  EXPECT_NE(sessionOf(0, id), nullptr);
  EXPECT_EQ(service_->sessionIndex().clients().size(), 1U);
}

TEST_F(ServiceShortMemory, AStartThatFailsCanBeTriedAgain) {
  std::int64_t id = 100;
  create(client_, id);
  start(client_, id, held_);
  const std::ptrdiff_t allWorkers = runningWorkers(id);
  stop(client_, id);
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ordinal += 1 + ordinal / 10) {
    create(client_, ++id);
    happened = runWithout(ordinal, [&] { client_.remote().startReportingSessionForID(id, [](const auto&, bool) {}); });
    if (!sessionRuns(id)) {
      start(client_, id, held_);
    }
    ASSERT_TRUE(sessionRuns(id)) << ordinal;
    ASSERT_EQ(runningWorkers(id), allWorkers) << ordinal;
    stop(client_, id);
    ASSERT_FALSE(sessionRuns(id)) << ordinal;
  }
  EXPECT_EQ(service_->sessionIndex().runningCount(), 0U);
}

TEST_F(ServiceShortMemory, AStopThatFailsCanBeTriedAgain) {
  std::int64_t id = 100;
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ordinal += 1 + ordinal / 10) {
    create(client_, ++id);
    start(client_, id, held_);
    send(client_, {{"text", "some"}}, std::vector<std::int64_t>{id});
    happened = runWithout(ordinal, [&] { client_.remote().stopReportingSessionForID(id, [](const auto&, bool) {}); });
    if (sessionRuns(id)) {
      stop(client_, id);
    }
    ASSERT_FALSE(sessionRuns(id)) << ordinal;
  }
  EXPECT_EQ(service_->sessionIndex().runningCount(), 0U);
}

TEST_F(ServiceShortMemory, AClientsEndLeavesNothingOfItBehind) {
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ordinal += 1 + ordinal / 10) {
    const Client gone = connect(50);
    for (std::int64_t id = 1; id <= 3; ++id) {
      create(gone, id);
      start(gone, id, held_);
    }
    // What the platform hands over at a connection's end has its room.
    gone.connection->invalidate();
    happened = runWithout(ordinal, [] {});
    ASSERT_EQ(service_->getAllClients().size(), 2U) << ordinal;
    ASSERT_EQ(service_->sessionCount(), 0U) << ordinal;
    ASSERT_EQ(service_->sessionIndex().runningCount(), 0U) << ordinal;
  }
}

TEST_F(ServiceShortMemory, TheSessionForMessagesWithoutOneIsMadeByTheNextWhenItCouldNot) {
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ordinal += 1 + ordinal / 10) {
    happened = sendWithout(ordinal, client_, std::nullopt);
    EXPECT_EQ(send(client_, {{"again", ordinal}}, std::nullopt), std::nullopt);
    ASSERT_EQ(service_->sessionCount(), 1U);
    platform_.clock.advance(std::chrono::seconds(30));
    platform_.runUntilIdle();
    platform_.clock.advance(std::chrono::seconds(30));
    platform_.runUntilIdle();
    ASSERT_EQ(service_->sessionCount(), 0U) << ordinal;
  }
}

TEST_F(ServiceShortMemory, TheSessionForMessagesWithoutOneEndsWhenNoFurtherLookAtItCanBeSet) {
  constexpr std::chrono::seconds kTimeout(5);
  static_assert(static_cast<double>(kTimeout.count()) == TarnReportingService::kSingleMessageSessionTimeoutSeconds);
  bool happened = true;
  for (std::uint64_t ordinal = 1; happened; ++ordinal) {
    send(client_, {{"first", ordinal}}, std::nullopt);
    platform_.clock.advance(kTimeout / 2);
    send(client_, {{"second", ordinal}}, std::nullopt);  // at the first look it isn't idle for so long
    platform_.clock.advance(kTimeout / 2 + std::chrono::seconds(2));
    happened = runWithout(ordinal, [] {});
    platform_.clock.advance(2 * kTimeout);
    platform_.runUntilIdle();
    ASSERT_EQ(service_->sessionCount(), 0U) << ordinal;
  }
}

}  // namespace
}  // namespace tarn
