// SPDX-License-Identifier: Apache-2.0
// The messages of a run come to what each would have come to alone.
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "platform/WorkQueue.h"
#include "plist/PackedBuilder.h"
#include "service/TarnReportingRunDelivery.h"
#include "service/TarnReportingSessionIndex.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;

struct Posted {
  plist::Dictionary payload;
  std::int64_t reporterID;
};

// Gives what was posted, and lets things happen before a message of this place is given.
class PostedRun final : public platform::MessageRun {
 public:
  explicit PostedRun(std::vector<Posted> posted) : posted_(std::move(posted)) {}
  const Message* next() override {
    if (const auto found = before.find(next_); found != before.end()) {
      found->second();
    }
    if (next_ == posted_.size()) return nullptr;
    const Posted& posted = posted_[next_++];
    keys_ = posted.payload.keys();
    draft_.begin(1024);
    for (const auto& entry : posted.payload) {
      draft_.add(entry.value);
    }
    draft_.finish(keys_);
    message_ = {&draft_, 4, 1, posted.reporterID};
    return &message_;
  }

  std::map<std::size_t, std::function<void()>> before;

 private:
  std::vector<Posted> posted_;
  std::size_t next_ = 0;
  plist::KeyList keys_;
  plist::PackedBuilder::Draft draft_;
  Message message_;
};

class RunDelivery : public ServiceFixture {
 protected:
  RunDelivery() : client_(connect(41)), other_(connect(42)) {
    create(client_, 7);
    start(client_, 7, held_[0]);
    create(other_, 8);
    start(other_, 8, held_[1]);
    platform_.log.clear();
  }
  void deliver(PostedRun& run) {
    TarnReportingUtilityGetReportingServerQueue()->async([this, &run] { client_.remote().sendMessages(run); });
    platform_.runUntilIdle();
  }
  plist::Dictionary number(int value) const {
    return {{"number", value}, {"tarnreporting_timestamp", platform_.clock.epochSeconds()}};
  }
  // The numbers in a session's log.
  static std::vector<std::int64_t> numbersOf(const TarnReportingSession& session) {
    std::vector<std::int64_t> numbers;
    for (const auto& record : session.messages()) {
      if (record->message().contains("number")) {
        numbers.push_back(record->message()["number"].asInt64());
      }
    }
    return numbers;
  }
  std::uint64_t counted(TarnReportingOutcome outcome) const { return service_->messageCounts().of(outcome); }

  Client client_;
  Client other_;
  Answer<bool> held_[2];
};

TEST_F(RunDelivery, EachMessageReachesTheSessionThatItNames) {
  platform_.log.setThreshold(LogLevel::Default);  // else each look-up is told
  PostedRun run({{number(1), 7}, {number(2), 8}, {number(3), 8}, {number(4), 7}});
  deliver(run);
  EXPECT_EQ(numbersOf(*sessionOf(0, 7)), (std::vector<std::int64_t>{1, 4}));
  EXPECT_EQ(numbersOf(*sessionOf(1, 8)), (std::vector<std::int64_t>{2, 3}));
  EXPECT_EQ(counted(TarnReportingOutcome::Delivered), 4U);
}

TEST_F(RunDelivery, EachMessageIsCountedForWhatBecameOfIt) {
  PostedRun run({{number(1), 7}, {number(1), 7}, {number(2), 99}, {number(2), 0}, {number(3), 7}});
  run.before[4] = [this] { service_->setReportingEnabled(false); };
  deliver(run);
  EXPECT_EQ(counted(TarnReportingOutcome::Delivered), 1U);
  EXPECT_EQ(counted(TarnReportingOutcome::Redundant), 1U);
  EXPECT_EQ(counted(TarnReportingOutcome::WithoutSession), 2U);
  EXPECT_EQ(counted(TarnReportingOutcome::Refused), 1U);
}

TEST_F(RunDelivery, AMessageIsCountedBeforeTheNextOneIsAskedFor) {
  PostedRun run({{number(1), 7}, {number(2), 7}});
  std::vector<std::uint64_t> counts;
  for (std::size_t place = 0; place < 3; ++place) {
    run.before[place] = [&] { counts.push_back(counted(TarnReportingOutcome::Delivered)); };
  }
  deliver(run);
  EXPECT_EQ(counts, (std::vector<std::uint64_t>{0, 1, 2}));
}

// In place of the service: sessions that come and go while a run is delivered.
class FewSessions final : public TarnReportingServiceDelegateProtocol {
 public:
  const Clients& getAllClients() const override { return clients_; }
  bool isReportingEnabled() const override { return true; }
  Sessions getAllActiveReportingSessions() override { return {}; }
  std::shared_ptr<TarnReportingSession> findReportingSessionForID(std::int64_t reporterID) override {
    ++lookUps;
    const auto found = sessions.find(reporterID);
    return found == sessions.end() ? nullptr : found->second;
  }
  Sessions findReportingSessionsForIDs(const platform::ReporterIDs&) override { return {}; }
  bool findNextSessions(SessionSearch&) override { return true; }
  void removeClient(const TarnReportingClientServerInstance&) override {}
  void logReportingSessions() override {}
  TarnReportingClientEnd clientEnd() const override { return TarnReportingClientEnd::ClientGone; }
  const TarnReportingSessionIndex& sessionIndex() const override { return index; }
  void countMessage(TarnReportingOutcome outcome) override { counts.add(outcome); }

  std::map<std::int64_t, std::shared_ptr<TarnReportingSession>> sessions;
  TarnReportingSessionIndex index;
  TarnReportingMessageCounts counts;
  int lookUps = 0;

 private:
  Clients clients_;
};

class RunAmongChanges : public RunDelivery {
 protected:
  RunAmongChanges() { platform_.log.setThreshold(LogLevel::Default); }
  void deliver(PostedRun& run) {
    TarnReportingRunDelivery delivery(41, few_);
    while (const auto* const message = run.next()) {
      delivery.deliver(*message);
    }
  }
  std::shared_ptr<TarnReportingSession> makeSession() {
    return few_->sessions[7] = TarnReportingSession::initWithID(7, {41});
  }

  std::shared_ptr<FewSessions> few_ = std::make_shared<FewSessions>();
};

TEST_F(RunAmongChanges, ASessionIsLookedUpOnceWhileNothingChanges) {
  const auto session = makeSession();
  PostedRun run({{number(1), 7}, {number(2), 7}, {number(3), 7}});
  deliver(run);
  EXPECT_EQ(numbersOf(*session), (std::vector<std::int64_t>{1, 2, 3}));
  EXPECT_EQ(few_->lookUps, 1);
}

TEST_F(RunAmongChanges, ASessionIsLookedUpForEachWhereThatIsTold) {
  platform_.log.setThreshold(LogLevel::Info);
  makeSession();
  PostedRun run({{number(1), 7}, {number(2), 7}, {number(3), 7}});
  deliver(run);
  EXPECT_EQ(few_->lookUps, 3);
}

TEST_F(RunAmongChanges, ASessionThatIsReplacedInTheMiddleGetsNoMore) {
  const auto first = makeSession();
  std::shared_ptr<TarnReportingSession> second;
  PostedRun run({{number(1), 7}, {number(2), 7}});
  run.before[1] = [&] {
    second = makeSession();
    few_->index.noteReplaced();
  };
  deliver(run);
  EXPECT_EQ(numbersOf(*first), std::vector<std::int64_t>{1});
  EXPECT_EQ(numbersOf(*second), std::vector<std::int64_t>{2});
}

TEST_F(RunAmongChanges, ASessionThatGoesInTheMiddleGetsNoMore) {
  const auto session = makeSession();
  PostedRun run({{number(1), 7}, {number(2), 7}});
  run.before[1] = [&] {
    few_->sessions.clear();
    few_->index.noteReplaced();
  };
  deliver(run);
  EXPECT_EQ(numbersOf(*session), std::vector<std::int64_t>{1});
  EXPECT_EQ(few_->counts.of(TarnReportingOutcome::WithoutSession), 1U);
}

TEST_F(RunAmongChanges, ASessionThatIsMadeInTheMiddleGetsWhatComesThen) {
  PostedRun run({{number(1), 7}, {number(2), 7}});
  run.before[1] = [&] { makeSession(); };
  deliver(run);
  EXPECT_EQ(few_->counts.of(TarnReportingOutcome::WithoutSession), 1U);
  EXPECT_EQ(numbersOf(*few_->sessions[7]), std::vector<std::int64_t>{2});
}

TEST_F(RunDelivery, MessagesAreToldAndTracedAsSingleOnes) {
  const auto told = [this](const std::function<void()>& sendAll) {
    platform_.log.clear();
    platform_.tracePoints.clear();
    sendAll();
    std::vector<std::string> all;
    for (const char* const category : {"tarnrc", "tarnrs", "tarnrr"}) {
      for (const std::string& line : lines(category)) {
        all.push_back(line);
      }
    }
    for (const auto& point : platform_.tracePoints.emitted()) {
      all.push_back(std::to_string(point.code) + " " + std::to_string(point.argument));
    }
    return all;
  };
  const std::vector<Posted> posted{{number(1), 7}, {number(1), 7}, {number(2), 99}, {number(3), 7}};
  const auto alone = told([&] {
    for (const Posted& each : posted) {
      static_cast<void>(send(client_, each.payload, std::vector<std::int64_t>{each.reporterID}));
    }
  });
  destroy(client_, 7);
  create(client_, 7);
  start(client_, 7, held_[0]);
  PostedRun run(posted);
  EXPECT_EQ(told([&] { deliver(run); }), alone);
  EXPECT_GT(alone.size(), 12U);
}

}  // namespace
}  // namespace tarn
