// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderSnareService.h"

#include <atomic>
#include <condition_variable>
#include <mutex>
#include <regex>
#include <set>

#include "host/loop/LinuxWorkQueues.h"
#include "host/machine/LinuxRandomSource.h"
#include "testing/ManualWorkQueues.h"
#include "tests/host/loop/SteadyClock.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

using platform::SnareReason;
using platform::SnareReplyKeys;
using platform::SnareRequest;
using Reply = std::optional<Dictionary>;

// Replies as they come, on whichever thread.
class Replies {
 public:
  auto handler() {
    return [this](const Reply& reply) {
      const std::lock_guard lock(mutex_);
      replies_.push_back(reply.value_or(Dictionary{{"none", true}}));
      thread_ = std::this_thread::get_id();
    };
  }
  std::vector<Dictionary> all() const {
    const std::lock_guard lock(mutex_);
    return replies_;
  }
  std::vector<Dictionary> once(std::size_t count) const {
    EXPECT_TRUE(eventually([&] { return all().size() >= count; }));
    return all();
  }
  std::thread::id thread() const {
    const std::lock_guard lock(mutex_);
    return thread_;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<Dictionary> replies_;
  std::thread::id thread_;
};

// A handler that stays in its call until it is let go.
class Gate {
 public:
  auto handler() {
    return [this](const Reply&) {
      std::unique_lock lock(mutex_);
      entered_ = true;
      changed_.notify_all();
      changed_.wait(lock, [this] { return open_; });
    };
  }
  void waitUntilEntered() {
    std::unique_lock lock(mutex_);
    EXPECT_TRUE(changed_.wait_for(lock, kPatience, [this] { return entered_; }));
  }
  void open() {
    const std::lock_guard lock(mutex_);
    open_ = true;
    changed_.notify_all();
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  bool entered_ = false;
  bool open_ = false;
};

class RecorderSnareServiceTest : public RecorderFixture {
 protected:
  RecorderSnareService& makeService(std::optional<SnareReason> refuse = {}) {
    service_ = std::make_unique<RecorderSnareService>(start(), clock_, randomSource_, workQueues_, refuse);
    return *service_;
  }
  std::vector<std::string> rows(const std::string& columns) {
    EXPECT_TRUE(flush());
    return ask(file(), "SELECT " + columns + " FROM events ORDER BY id");
  }

  linux_host::LinuxRandomSource randomSource_;
  Replies replies_;
  tarn::testing::SteadyClock steady_;
  linux_host::LinuxWorkQueues workQueues_{steady_, nullptr};
  std::unique_ptr<RecorderSnareService> service_;  // goes before the recorder and what it replies to
};

TEST_F(RecorderSnareServiceTest, RecordsASnapshotWithItsPayloadSignatureAndDuration) {
  clock_.setEpochSeconds(1763632800.5);
  const auto reporter = makeService().createReporter();
  const Dictionary signature = reporter->makeSignature({"AudioAnalytics", "haptics", "Playback", "Wattlog", "x", {}});
  const plist::Array processIDs{4711};
  EXPECT_TRUE(reporter->requestSnapshot({signature, 0, Dictionary{{"processIDs", processIDs}}}, replies_.handler()));
  EXPECT_EQ(
      rows("id, time, backend, name, payload, detail"),
      (std::vector<std::string>{R"(1|1763632800.5|snare|requestSnapshot|{"processIDs":[4711]}|)"
                                R"({"signature":{"domain":"AudioAnalytics","type":"haptics","subType":"Playback",)"
                                R"("subTypeContext":"Wattlog","detectedProcess":"x"},"duration":0.0})"}));
}

TEST_F(RecorderSnareServiceTest, RecordsAStartWithoutPayloadAndACancel) {
  const auto reporter = makeService().createReporter();
  EXPECT_TRUE(reporter->startSession({{{"domain", "d"}}, 60, {}}, replies_.handler()));
  reporter->cancelSession("NONE_RETURNED");
  EXPECT_EQ(rows("name, payload, detail"),
            (std::vector<std::string>{R"(startSession|{}|{"signature":{"domain":"d"},"duration":60.0})",
                                      R"(cancelSession|{}|{"session":"NONE_RETURNED"})"}));
}

TEST_F(RecorderSnareServiceTest, LeavesAbsentFieldsOutOfASignature) {
  const auto reporter = makeService().createReporter();
  EXPECT_EQ(reporter->makeSignature({"d", "t", "s", "c", {}, {}}),
            (Dictionary{{"domain", "d"}, {"type", "t"}, {"subType", "s"}, {"subTypeContext", "c"}}));
  const Dictionary values{{"level", 3}};
  EXPECT_EQ(reporter->makeSignature({"d", "t", "s", "c", "p", values}),
            (Dictionary{{"domain", "d"},
                        {"type", "t"},
                        {"subType", "s"},
                        {"subTypeContext", "c"},
                        {"detectedProcess", "p"},
                        {"triggerThresholdValues", values}}));
}

TEST_F(RecorderSnareServiceTest, RepliesOnAQueueOfItsOwnWithAFreshIdentifier) {
  const auto reporter = makeService().createReporter();
  constexpr std::size_t kRequests = 50;
  for (std::size_t i = 0; i < kRequests; ++i) {
    EXPECT_TRUE(i % 2 == 0 ? reporter->requestSnapshot({}, replies_.handler())
                           : reporter->startSession({}, replies_.handler()));
  }
  const auto replies = replies_.once(kRequests);
  ASSERT_EQ(replies.size(), kRequests);
  EXPECT_NE(replies_.thread(), std::this_thread::get_id());
  std::set<std::string> identifiers;
  const std::regex form("[0-9A-F]{8}(-[0-9A-F]{4}){3}-[0-9A-F]{12}");
  for (const Dictionary& reply : replies) {
    EXPECT_EQ(reply.size(), 2U);
    EXPECT_EQ(reply.get(SnareReplyKeys::kSuccess), plist::ValueView(true));
    const std::string identifier = reply.get(SnareReplyKeys::kSessionIdentifier).asText();
    EXPECT_TRUE(std::regex_match(identifier, form)) << identifier;
    identifiers.insert(identifier);
  }
  EXPECT_EQ(identifiers.size(), kRequests);
}

TEST_F(RecorderSnareServiceTest, RefusesWithTheReasonAndRecordsTheRequestAllTheSame) {
  const auto reporter = makeService(SnareReason::DailyLimitExceeded).createReporter();
  EXPECT_TRUE(reporter->startSession({{{"domain", "d"}}, 60, {}}, replies_.handler()));
  EXPECT_EQ(replies_.once(1),
            (std::vector<Dictionary>{{{SnareReplyKeys::kSuccess, false}, {SnareReplyKeys::kReasonCode, 6}}}));
  EXPECT_EQ(rows("name"), (std::vector<std::string>{"startSession"}));
}

TEST_F(RecorderSnareServiceTest, RefusesOrNoMoreAsItIsToldWhileItRuns) {
  RecorderSnareService& service = makeService(SnareReason::DailyLimitExceeded);
  const auto reporter = service.createReporter();
  service.setRefusal(std::nullopt);
  EXPECT_TRUE(reporter->startSession({{{"domain", "d"}}, 60, {}}, replies_.handler()));
  EXPECT_EQ(replies_.once(1).at(0).get(SnareReplyKeys::kSuccess), plist::ValueView(true));
  service.setRefusal(SnareReason::DailyLimitExceeded);
  EXPECT_TRUE(reporter->startSession({{{"domain", "d"}}, 60, {}}, replies_.handler()));
  EXPECT_EQ(replies_.once(2).at(1).get(SnareReplyKeys::kReasonCode), plist::ValueView(6));
}

TEST_F(RecorderSnareServiceTest, ARequestLivesOnWhenItsReporterIsGone) {
  makeService();
  EXPECT_TRUE(service_->createReporter()->requestSnapshot({}, replies_.handler()));
  EXPECT_EQ(replies_.once(1).size(), 1U);
}

TEST_F(RecorderSnareServiceTest, AHandlerMayAskAgain) {
  const auto reporter = makeService().createReporter();
  EXPECT_TRUE(reporter->requestSnapshot({}, [this, reporter](const Reply&) {
    EXPECT_TRUE(reporter->requestSnapshot({}, replies_.handler()));
    reporter->cancelSession("x");
  }));
  EXPECT_EQ(replies_.once(1).size(), 1U);
  EXPECT_EQ(rows("name").size(), 3U);
}

TEST_F(RecorderSnareServiceTest, TakesNoMoreThanItsBoundWhileRepliesWait) {
  const auto reporter = makeService().createReporter();
  Gate gate;
  EXPECT_TRUE(reporter->requestSnapshot({}, gate.handler()));
  gate.waitUntilEntered();
  for (std::size_t i = 0; i < RecorderSnareService::kMostWaitingReplies; ++i) {
    ASSERT_TRUE(reporter->requestSnapshot({}, replies_.handler())) << i;
  }
  const auto kept = std::make_shared<int>(0);
  EXPECT_FALSE(reporter->requestSnapshot({}, [kept](const Reply&) {}));
  EXPECT_EQ(kept.use_count(), 1);  // its handler was dropped
  gate.open();
  replies_.once(RecorderSnareService::kMostWaitingReplies);
  EXPECT_EQ(rows("1").size(), RecorderSnareService::kMostWaitingReplies + 1);
  EXPECT_TRUE(reporter->requestSnapshot({}, replies_.handler()));
}

TEST_F(RecorderSnareServiceTest, ItsEndWaitsForTheHandlerThatRunsAndDropsWhatWaits) {
  const auto reporter = makeService().createReporter();
  std::atomic<bool> finished{false};
  Gate gate;
  EXPECT_TRUE(reporter->requestSnapshot({}, [&gate, &finished](const Reply& reply) {
    gate.handler()(reply);
    finished = true;
  }));
  gate.waitUntilEntered();
  const auto kept = std::make_shared<int>(0);
  EXPECT_TRUE(reporter->requestSnapshot({}, [kept](const Reply&) { ADD_FAILURE() << "replied"; }));
  std::thread end([this] { service_.reset(); });
  EXPECT_TRUE(eventually([&] { return !reporter->requestSnapshot({}, [](const Reply&) {}); }));
  gate.open();
  end.join();
  EXPECT_TRUE(finished);
  EXPECT_EQ(kept.use_count(), 1);
}

TEST_F(RecorderSnareServiceTest, AReporterThatOutlivesItTakesAndRecordsNothing) {
  const auto reporter = makeService().createReporter();
  service_.reset();
  EXPECT_FALSE(reporter->startSession({}, replies_.handler()));
  reporter->cancelSession("x");
  EXPECT_EQ(recorder_->counters().handedOver, 0U);
  EXPECT_EQ(reporter->makeSignature({"d", "t", "s", "c", {}, {}}).size(), 4U);
}

TEST_F(RecorderSnareServiceTest, MakesNoQueueForNobody) {
  tarn::testing::ManualWorkQueues queues(clock_);
  RecorderSnareService service(start(), clock_, randomSource_, queues, {});
  const auto reporter = service.createReporter();
  EXPECT_TRUE(queues.names().empty());
  EXPECT_TRUE(reporter->requestSnapshot({}, replies_.handler()));
  EXPECT_EQ(queues.names().size(), 1U);
}

TEST_F(RecorderSnareServiceTest, TakesRequestsOfManyThreads) {
  constexpr int kThreads = 4;
  constexpr int kEach = 100;
  makeService();
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([this] {
      const auto reporter = service_->createReporter();
      for (int i = 0; i < kEach; ++i) {
        EXPECT_TRUE(reporter->requestSnapshot({}, replies_.handler()));
        reporter->cancelSession("x");
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  EXPECT_EQ(replies_.once(kThreads * kEach).size(), std::size_t{kThreads * kEach});
  EXPECT_EQ(rows("1").size(), std::size_t{2 * kThreads * kEach});
}

}  // namespace
}  // namespace tarn::recorder
